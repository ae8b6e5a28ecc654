/* Platform log. Lines carry a tag and a priority; this build prints them to
 * stderr from the level named by PLATFORM_LOG_LEVEL (V, D, I, W, E, F; default W)
 * and keeps every line in an in-process record that tests can read. */
#ifndef PLATFORM_LOG_H
#define PLATFORM_LOG_H

#include <stdarg.h>
#include <stddef.h>

#include <platform_error.h>

#ifdef __cplusplus
extern "C" {
#endif

#define PLATFORM_LOG_API __attribute__((visibility("default")))

/* Priorities, from the most talkative; a line is printed when its priority
 * is at least the level chosen. */
enum {
	PLATFORM_LOG_VERBOSE = 1,
	PLATFORM_LOG_DEBUG,
	PLATFORM_LOG_INFO,
	PLATFORM_LOG_WARN,
	PLATFORM_LOG_ERROR,
	PLATFORM_LOG_FATAL,
	PLATFORM_LOG_SILENT
};

/* Logs one line; returns its length, or PLATFORM_ERROR_INVALID_PARAMETER
 * without a format. */
PLATFORM_LOG_API int __dlog_print(int prio, const char *tag, const char *fmt, ...)
	__attribute__((format(printf, 3, 4)));
PLATFORM_LOG_API int __dlog_vprint(int prio, const char *tag, const char *fmt, va_list ap);

/* In-process record of the lines printed since the last clear. Texts are
 * the formatted lines exactly as printed, without the tag. */
PLATFORM_LOG_API void platform_log_record_clear(void);
PLATFORM_LOG_API size_t platform_log_record_count(void);
PLATFORM_LOG_API int platform_log_record_priority(size_t index);
PLATFORM_LOG_API const char *platform_log_record_tag(size_t index);
PLATFORM_LOG_API const char *platform_log_record_text(size_t index);

#ifdef __cplusplus
}
#endif

#endif
