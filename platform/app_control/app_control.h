/* Application control: launch requests to other applications. A launch
 * runs the launcher registered for the app id: an executable file named
 * after the app id in the launcher directory ($APP_CONTROL_LAUNCHER_DIR,
 * default /usr/share/app-control/launchers). It is started with the
 * operation, the caller's window id and the extra data as arguments:
 *   <launcher> --operation <op> --window <id> [--data key=value]... */
#ifndef APP_CONTROL_H
#define APP_CONTROL_H

#include <tizen_error.h>

#ifdef __cplusplus
extern "C" {
#endif

#define APP_CONTROL_API __attribute__((visibility("default")))

typedef struct app_control_s *app_control_h;

#define APP_CONTROL_OPERATION_DEFAULT "http://marlune.org/appcontrol/operation/default"
#define APP_CONTROL_OPERATION_VIEW "http://marlune.org/appcontrol/operation/view"

typedef enum {
	APP_CONTROL_ERROR_NONE = TIZEN_ERROR_NONE,
	APP_CONTROL_ERROR_INVALID_PARAMETER = TIZEN_ERROR_INVALID_PARAMETER,
	APP_CONTROL_ERROR_OUT_OF_MEMORY = TIZEN_ERROR_OUT_OF_MEMORY,
	APP_CONTROL_ERROR_APP_NOT_FOUND = TIZEN_ERROR_APPLICATION | 0x21,
	APP_CONTROL_ERROR_KEY_NOT_FOUND = TIZEN_ERROR_KEY_NOT_AVAILABLE,
	APP_CONTROL_ERROR_LAUNCH_REJECTED = TIZEN_ERROR_APPLICATION | 0x22,
	APP_CONTROL_ERROR_LAUNCH_FAILED = TIZEN_ERROR_APPLICATION | 0x23
} app_control_error_e;

typedef enum {
	APP_CONTROL_RESULT_APP_STARTED = 1,
	APP_CONTROL_RESULT_SUCCEEDED = 0,
	APP_CONTROL_RESULT_FAILED = -1,
	APP_CONTROL_RESULT_CANCELED = -2
} app_control_result_e;

typedef void (*app_control_reply_cb)(app_control_h request, app_control_h reply,
				     app_control_result_e result, void *user_data);

APP_CONTROL_API int app_control_create(app_control_h *app_control);
APP_CONTROL_API int app_control_destroy(app_control_h app_control);
APP_CONTROL_API int app_control_set_operation(app_control_h app_control, const char *operation);
APP_CONTROL_API int app_control_get_operation(app_control_h app_control, char **operation);
APP_CONTROL_API int app_control_set_app_id(app_control_h app_control, const char *app_id);
APP_CONTROL_API int app_control_get_app_id(app_control_h app_control, char **app_id);
APP_CONTROL_API int app_control_set_window(app_control_h app_control, unsigned int id);
APP_CONTROL_API int app_control_add_extra_data(app_control_h app_control, const char *key, const char *value);
/* Starts the registered launcher and returns at once (the launcher is not
 * waited for); APP_CONTROL_ERROR_APP_NOT_FOUND when none is registered, and
 * APP_CONTROL_ERROR_INVALID_PARAMETER without an operation or app id, or
 * for an app id that is not a plain file name. Launchers send no reply, so
 * `callback` is never called. */
APP_CONTROL_API int app_control_send_launch_request(app_control_h app_control,
						    app_control_reply_cb callback, void *user_data);

#ifdef __cplusplus
}
#endif

#endif
