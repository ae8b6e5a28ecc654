/* Usage log: one entry per feature use, sent through the usage-log client.
 * Fire and forget: nothing here changes what the editor does. */
#include <kv_bundle.h>
#include <vantric_log_manager.h>

#include "editor-svc-private.h"

#define IE_USAGE_LOG_URI "content://org.marlune.vantric.log/log/use_app_feature_survey"

void *log_manager_create(void)
{
	vantric_log_manager_h handle = NULL;
	int err = vantric_log_manager_create(&handle);
	if (err != 0) {
		IE_LOG_E("vantric_log_manager_create failed, err=%d", err);
		return NULL;
	}
	return handle;
}

void _ie_log_manager_create(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	if (!vh->log_handle)
		vh->log_handle = log_manager_create();
}

void _ie_log_manager_insert(Viewhandle *vh, const char *feature)
{
	IE_CHECK_AS(vh, "data");
	if (!vh->log_handle)
		_ie_log_manager_create(vh);
	if (!vh->log_handle)
		return;

	Kv_Bundle *entry = bundle_create();
	if (!entry)
		return;
	bundle_add(entry, "app_id", IE_HOST_PKGID);
	bundle_add(entry, "feature", feature);
	int request_id = 0;
	vantric_log_manager_insert(static_cast<vantric_log_manager_h>(vh->log_handle), IE_USAGE_LOG_URI, entry,
				   NULL, NULL, &request_id);
	bundle_free(entry);
}

void _ie_log_manager_destroy(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	if (vh->log_handle) {
		vantric_log_manager_destroy(static_cast<vantric_log_manager_h>(vh->log_handle));
		vh->log_handle = NULL;
	}
}
