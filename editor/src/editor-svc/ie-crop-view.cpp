/* The crop view: the picture refitted in crop mode under the crop layout.
 * The selection box over the picture is laid by the selection-box module;
 * without a box there is no region to crop. */
#include "editor-svc-private.h"
#include "ie-image.h"

void ie_create_crop_view(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");

	_ie_log_manager_insert(vh, "CROP");

	ie_image_refit(vh->main_image);
	ie_image_mode_set(vh->main_image, IE_IMAGE_MODE_CROP);
	ie_image_double_tap_enabled_set(EINA_FALSE, vh->main_image);

	elm_object_domain_translatable_part_text_set(vh->funcbar, "elm.text.title", IE_TEXT_DOMAIN, "IDS_IV_BODY_CROP");

	if (vh->layout)
		elm_object_signal_emit(vh->layout,
				       ie_rotation_is_portrait(ie_window_rotation_get()) ? "crop,portrait" : "crop,landscape",
				       "elm");

	Evas_Object *crop_layout = create_layout(vh->layout, "iv-edit-crop");
	if (!crop_layout) {
		IE_LOG_E("Cannot create layout");
		return;
	}
	elm_object_disabled_set(vh->done_btn, EINA_FALSE);
	evas_object_repeat_events_set(crop_layout, EINA_TRUE);
	evas_object_name_set(crop_layout, "Crop Layout");
	vh->crop_layout = crop_layout;
	evas_object_show(crop_layout);
	elm_object_part_content_set(vh->layout, "elm.swallow.content.subview", crop_layout);
}

void ie_delete_crop_view(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");

	if (vh->selectbox) {
		evas_object_del(vh->selectbox);
		vh->selectbox = NULL;
	}
	if (vh->crop_layout) {
		evas_object_del(vh->crop_layout);
		vh->crop_layout = NULL;
	}

	if (vh->effect_applied || vh->rotated)
		vh->edited = EINA_TRUE;
	else if (!vh->edited)
		elm_object_disabled_set(vh->done_btn, EINA_TRUE);

	elm_object_signal_emit(vh->layout, "elm,state,toolbar,show", "elm");

	ie_image_size_update(vh->main_image);
	ie_image_mode_set(vh->main_image, IE_IMAGE_MODE_NORMAL);
	ie_image_double_tap_enabled_set(EINA_TRUE, vh->main_image);

	elm_object_domain_translatable_part_text_set(vh->funcbar, "elm.text.title", IE_TEXT_DOMAIN, "IDS_ST_BODY_EDIT");
}

Eina_Bool ie_crop_region_get(Viewhandle *vh, Evas_Coord *x, Evas_Coord *y, Evas_Coord *w, Evas_Coord *h)
{
	if (!vh || !vh->selectbox)
		return EINA_FALSE;
	evas_object_geometry_get(vh->selectbox, x, y, w, h);
	return EINA_TRUE;
}
