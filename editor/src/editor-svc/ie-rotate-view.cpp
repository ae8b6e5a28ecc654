/* The rotate view: each pick of a rotate tool turns the picture a quarter
 * turn at once (direction 1 right, 3 left) and fits it anew. */
#include "editor-svc-private.h"
#include "ie-engine.h"
#include "ie-image.h"
#include "ie-malloc-ptr.h"

static void apply_rotate_effect(Viewhandle *vh, int direction)
{
	Evas_Object *inner = ie_image_object_get(vh->main_image);
	int w = 0, h = 0;
	evas_object_image_size_get(inner, &w, &h);
	auto *pixels = static_cast<uint8_t *>(ie_image_data_get(vh->main_image));
	if (!pixels) {
		IE_LOG_E("Image Internal Buffer Get Failed");
		return;
	}
	/* The turn writes every byte of a buffer the main image then takes
	 * over as it is: no copy into Evas's buffer, and a later crop works
	 * within it. */
	size_t bytes = static_cast<size_t>(w) * h * 4;
	Ie_Malloc_Ptr<uint8_t> rotated(static_cast<uint8_t *>(malloc(bytes)));
	if (!rotated) {
		IE_LOG_E("Calloc Failed, Failed to apply effect ");
		return;
	}
	IEL_Image source = {static_cast<uint32_t>(w), static_cast<uint32_t>(h), IEL_FORMAT_BGRA8888, pixels};
	IEL_Image output = {static_cast<uint32_t>(w), static_cast<uint32_t>(h), IEL_FORMAT_BGRA8888, rotated.get()};
	if (IEL_Rotate_Image(&source, &output, static_cast<unsigned int>(direction)) != IEL_OK) {
		IE_LOG_E("the picture cannot be turned");
		return;
	}
	const Eina_Bool shown = ie_image_pixels_take(vh->main_image, rotated.release(), h, w);
	ie_image_size_update(vh->main_image);
	if (!shown)
		return;
	vh->edited = EINA_TRUE;
	vh->rotated = EINA_TRUE;
}

void ie_create_rotate_view(Viewhandle *vh, int direction)
{
	IE_CHECK_AS(vh, "data");
	ie_image_refit(vh->main_image);
	elm_object_domain_translatable_part_text_set(vh->funcbar, "elm.text.title", IE_TEXT_DOMAIN, "IDS_ST_BODY_EDIT");
	elm_object_disabled_set(vh->done_btn, EINA_FALSE);
	apply_rotate_effect(vh, direction);
}
