/* Platform log. Lines carry a tag and a priority; this build prints them to
 * stderr from the level named by DLOG_LEVEL (V, D, I, W, E, F; default W)
 * and keeps every line in an in-process record that tests can read. */
#ifndef DLOG_H
#define DLOG_H

#include <stdarg.h>
#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

#define DLOG_API __attribute__((visibility("default")))

typedef enum {
	LOG_ID_MAIN = 0,
	LOG_ID_RADIO,
	LOG_ID_SYSTEM,
	LOG_ID_APPS,
	LOG_ID_MAX
} log_id_t;

typedef enum {
	DLOG_UNKNOWN = 0,
	DLOG_DEFAULT,
	DLOG_VERBOSE,
	DLOG_DEBUG,
	DLOG_INFO,
	DLOG_WARN,
	DLOG_ERROR,
	DLOG_FATAL,
	DLOG_SILENT
} log_priority;

enum { DLOG_ERROR_NONE = 0, DLOG_ERROR_INVALID_PARAMETER = -22 };

DLOG_API int __dlog_print(log_id_t log_id, int prio, const char *tag, const char *fmt, ...)
	__attribute__((format(printf, 4, 5)));
DLOG_API int __dlog_vprint(log_id_t log_id, int prio, const char *tag, const char *fmt, va_list ap);

/* In-process record of the lines printed since the last clear. Texts are
 * the formatted lines exactly as printed, without the tag. */
DLOG_API void dlog_record_clear(void);
DLOG_API size_t dlog_record_count(void);
DLOG_API int dlog_record_priority(size_t index);
DLOG_API const char *dlog_record_tag(size_t index);
DLOG_API const char *dlog_record_text(size_t index);

#ifdef __cplusplus
}
#endif

#endif
