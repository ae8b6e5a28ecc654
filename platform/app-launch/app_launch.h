/* Application control: launch requests to other applications. A launch
 * runs the launcher registered for the app id: an executable file named
 * after the app id in the launcher directory ($APP_LAUNCH_DIR,
 * default /usr/share/app-control/launchers). It is started with the
 * operation, the caller's window id and the extra data as arguments:
 *   <launcher> --operation <op> --window <id> [--data key=value]... */
#ifndef APP_LAUNCH_H
#define APP_LAUNCH_H

#include <platform_error.h>

#ifdef __cplusplus
extern "C" {
#endif

#define APP_LAUNCH_API __attribute__((visibility("default")))

typedef struct App_Request App_Request;

#define APP_LAUNCH_OPERATION_DEFAULT "http://marlune.org/appcontrol/operation/default"
#define APP_LAUNCH_OPERATION_VIEW "http://marlune.org/appcontrol/operation/view"

typedef enum {
	APP_LAUNCH_ERROR_NONE = PLATFORM_ERROR_NONE,
	APP_LAUNCH_ERROR_INVALID_PARAMETER = PLATFORM_ERROR_INVALID_PARAMETER,
	APP_LAUNCH_ERROR_OUT_OF_MEMORY = PLATFORM_ERROR_OUT_OF_MEMORY,
	APP_LAUNCH_ERROR_KEY_NOT_FOUND = PLATFORM_ERROR_KEY_NOT_FOUND,
	APP_LAUNCH_ERROR_APP_NOT_FOUND = PLATFORM_ERROR_BLOCK(3) - 1,
	APP_LAUNCH_ERROR_LAUNCH_REJECTED = PLATFORM_ERROR_BLOCK(3) - 2,
	APP_LAUNCH_ERROR_LAUNCH_FAILED = PLATFORM_ERROR_BLOCK(3) - 3
} App_Launch_Error;

typedef enum {
	APP_LAUNCH_RESULT_APP_STARTED = 1,
	APP_LAUNCH_RESULT_SUCCEEDED = 0,
	APP_LAUNCH_RESULT_FAILED = -1,
	APP_LAUNCH_RESULT_CANCELED = -2
} App_Launch_Result;

typedef void (*App_Launch_Reply_Cb)(App_Request *request, App_Request *reply,
				     App_Launch_Result result, void *user_data);

APP_LAUNCH_API int app_control_create(App_Request **app_control);
APP_LAUNCH_API int app_control_destroy(App_Request *app_control);
APP_LAUNCH_API int app_control_set_operation(App_Request *app_control, const char *operation);
APP_LAUNCH_API int app_control_operation_get(App_Request *app_control, char **operation);
APP_LAUNCH_API int app_control_set_app_id(App_Request *app_control, const char *app_id);
APP_LAUNCH_API int app_control_app_id_get(App_Request *app_control, char **app_id);
APP_LAUNCH_API int app_control_set_window(App_Request *app_control, unsigned int id);
APP_LAUNCH_API int app_control_extra_add(App_Request *app_control, const char *key, const char *value);
/* Starts the registered launcher and returns at once (the launcher is not
 * waited for); APP_LAUNCH_ERROR_APP_NOT_FOUND when none is registered, and
 * APP_LAUNCH_ERROR_INVALID_PARAMETER without an operation or app id, or
 * for an app id that is not a plain file name. Launchers send no reply, so
 * `callback` is never called. */
APP_LAUNCH_API int app_control_send_launch_request(App_Request *app_control,
						    App_Launch_Reply_Cb callback, void *user_data);

#ifdef __cplusplus
}
#endif

#endif
