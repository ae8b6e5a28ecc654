/* The view manager: which edit view is on screen, and every switch between
 * views (the view being left is closed before the next one opens). */
#include "editor-svc-private.h"

namespace {

/* One editor at a time: the current view belongs to the process and
 * survives editors, so a new editor starts from the last view. */
int current_view = IE_VIEW_TYPE_UNDEF;

constexpr const char *view_names[] = {
	"IE_VIEW_TYPE_UNDEF",
	"IE_VIEW_TYPE_MAIN",
	"IE_VIEW_TYPE_EFFECT",
	"IE_VIEW_TYPE_CROP",
	"IE_VIEW_TYPE_ROTATE_LEFT",
	"IE_VIEW_TYPE_ROTATE_RIGHT",
	"IE_VIEW_TYPE_SAVE",
};

const char *view_name(int view)
{
	constexpr int count = sizeof(view_names) / sizeof(view_names[0]);
	return (view >= 0 && view < count) ? view_names[view] : "IE_VIEW_TYPE_UNKNOWN";
}

bool is_rotate_view(int view)
{
	return view == IE_VIEW_TYPE_ROTATE_LEFT || view == IE_VIEW_TYPE_ROTATE_RIGHT;
}

void leave_view(int view, Viewhandle *vh)
{
	switch (view) {
	case IE_VIEW_TYPE_UNDEF:
		IE_LOG_I("Current mode is undef");
		break;
	case IE_VIEW_TYPE_MAIN:
	case IE_VIEW_TYPE_ROTATE_LEFT:
	case IE_VIEW_TYPE_ROTATE_RIGHT:
		/* A rotation is applied as it is entered; nothing to close. */
		break;
	case IE_VIEW_TYPE_EFFECT:
		ie_delete_effect_view(vh);
		break;
	case IE_VIEW_TYPE_CROP:
		ie_delete_crop_view(vh);
		break;
	default:
		IE_LOG_I("Unhandled View : %s", view_name(view));
		break;
	}
}

void enter_view(int view, Viewhandle *vh)
{
	switch (view) {
	case IE_VIEW_TYPE_UNDEF:
		break;
	case IE_VIEW_TYPE_MAIN:
		ie_set_main_view_text(vh);
		break;
	case IE_VIEW_TYPE_EFFECT:
		ie_create_effect_view(vh);
		break;
	case IE_VIEW_TYPE_CROP:
		ie_create_crop_view(vh);
		break;
	case IE_VIEW_TYPE_ROTATE_LEFT:
		ie_create_rotate_view(vh, 3);
		break;
	case IE_VIEW_TYPE_ROTATE_RIGHT:
		ie_create_rotate_view(vh, 1);
		break;
	default:
		IE_LOG_E("Unhandled View : %s", view_name(view));
		break;
	}
}

} // namespace

Eina_Bool ie_view_mgr_set_view(int view, Viewhandle *vh)
{
	/* Each entry into a rotation view turns the picture once more. */
	if (view == current_view && !is_rotate_view(view)) {
		IE_LOG_I("Same View transition. %s", view_name(view));
		return EINA_TRUE;
	}
	leave_view(current_view, vh);
	enter_view(view, vh);
	current_view = view;
	return EINA_TRUE;
}

int ie_view_mgr_get_current_view(void)
{
	return current_view;
}
