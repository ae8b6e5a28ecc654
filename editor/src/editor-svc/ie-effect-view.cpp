/* The effect view's entry points. The effect grid, thumbnails and the
 * intensity drag are built by the effect-view module; until then the view
 * opens empty and the picture stays as it is. */
#include "editor-svc-private.h"
#include "ie-image.h"

void ie_create_effect_view(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	ie_image_refit(vh->main_image);
}

void ie_delete_effect_view(Viewhandle *vh)
{
	IE_LOG_I("ie_delete_effect_view");
	IE_CHECK_AS(vh, "data");
}
