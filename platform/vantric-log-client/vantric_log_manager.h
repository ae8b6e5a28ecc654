/* Usage-log client (libcore-vantric-log-client.so.1): sends feature-usage
 * entries to the usage-log service. This build keeps the entries in a
 * SQLite database ($VANTRIC_LOG_DB, default /var/lib/editor-svc-platform/usage-log.db). */
#ifndef VANTRIC_LOG_MANAGER_H
#define VANTRIC_LOG_MANAGER_H

#include <kv_bundle.h>

#ifdef __cplusplus
extern "C" {
#endif

#define VANTRIC_API __attribute__((visibility("default")))

typedef struct vantric_log_manager_s *vantric_log_manager_h;

enum {
	VANTRIC_LOG_ERROR_NONE = PLATFORM_ERROR_NONE,
	VANTRIC_LOG_ERROR_INVALID_PARAMETER = PLATFORM_ERROR_INVALID_PARAMETER,
	VANTRIC_LOG_ERROR_OUT_OF_MEMORY = PLATFORM_ERROR_OUT_OF_MEMORY,
	VANTRIC_LOG_ERROR_IO = PLATFORM_ERROR_IO,
	VANTRIC_LOG_ERROR_NOT_CONNECTED = PLATFORM_ERROR_BLOCK(6) - 1
};

typedef void (*vantric_log_reply_cb)(int request_id, int result, void *user_data);

VANTRIC_API int vantric_log_manager_create(vantric_log_manager_h *handle);
/* Stores one entry (`uri` and every key-value pair of `entry`); calls the
 * reply callback, if any, before returning. `request_id` may be NULL. */
VANTRIC_API int vantric_log_manager_insert(vantric_log_manager_h handle, const char *uri, Kv_Bundle *entry,
					   vantric_log_reply_cb callback, void *user_data, int *request_id);
VANTRIC_API int vantric_log_manager_destroy(vantric_log_manager_h handle);

/* Inspection for tests and tools. */
/* Number of calls into the three functions above since the process started. */
VANTRIC_API int vantric_log_manager_call_count(void);
/* With `fail` set, every create fails (as with an unreachable service). */
VANTRIC_API void vantric_log_manager_fail_create(int fail);
/* Number of stored entries whose key `key` has the value `value`. */
VANTRIC_API int vantric_log_manager_count_entries(const char *key, const char *value);

#ifdef __cplusplus
}
#endif

#endif
