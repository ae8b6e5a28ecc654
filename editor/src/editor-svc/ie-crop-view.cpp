/* The crop view: the picture refitted in crop mode, the crop layout over it
 * and, once the picture is laid out, the selection box in the free mode.
 * Done applies the crop (ie-menu.cpp); Cancel leaves the picture as it is. */
#include "editor-svc-private.h"
#include "ie-image.h"
#include "ie-selectbox.h"

#define IE_CROP_BOX_COLOR "AO004"

static void crop_box_color_apply(Viewhandle *vh)
{
	int r = 0, g = 0, b = 0, a = 0;
	ea_theme_object_color_get(vh->layout, IE_CROP_BOX_COLOR, &r, &g, &b, &a, NULL, NULL, NULL, NULL, NULL, NULL,
				  NULL, NULL);
	evas_object_color_set(vh->selectbox, r, g, b, a);
}

static void _crop_box_theme_color_changed_cb(void *data)
{
	auto *vh = static_cast<Viewhandle *>(data);
	IE_CHECK(data);
	if (vh->selectbox)
		crop_box_color_apply(vh);
}

/* Runs once the picture has its place. The view deletes it when it closes
 * first, so the record and the crop layout are alive here. */
static Eina_Bool _create_crop_box_idler_cb(void *data)
{
	auto *vh = static_cast<Viewhandle *>(data);
	vh->crop_box_idler = NULL;

	Evas_Object *box = ie_selectbox_add(vh->crop_layout);
	if (!box)
		return ECORE_CALLBACK_CANCEL;
	vh->selectbox = box;
	crop_box_color_apply(vh);
	ea_theme_event_callback_add(ASSIST_THEME_EVENT_COLOUR, _crop_box_theme_color_changed_cb, vh);
	ie_selectbox_set_image(box, ie_image_object_get(vh->main_image));
	ie_selectbox_set_ratio(box, 0, 1);
	elm_object_part_content_set(vh->crop_layout, "elm.swallow.client", box);
	evas_object_show(box);
	elm_object_part_content_set(vh->layout, "elm.swallow.content.subview", vh->crop_layout);
	/* A swallow takes its part's event settings: set it again. */
	evas_object_repeat_events_set(vh->crop_layout, EINA_TRUE);
	return ECORE_CALLBACK_CANCEL;
}

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
	/* The picture under the layout still sees the touches: it is pinched
	 * while the box is dragged. */
	evas_object_repeat_events_set(crop_layout, EINA_TRUE);
	evas_object_name_set(crop_layout, "Crop Layout");
	vh->crop_layout = crop_layout;
	evas_object_show(crop_layout);

	if (vh->crop_box_idler)
		ecore_idler_del(vh->crop_box_idler);
	vh->crop_box_idler = ecore_idler_add(_create_crop_box_idler_cb, vh);
}

void ie_delete_crop_view(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");

	if (vh->crop_box_idler) {
		ecore_idler_del(vh->crop_box_idler);
		vh->crop_box_idler = NULL;
	}
	ea_theme_event_callback_del(ASSIST_THEME_EVENT_COLOUR, _crop_box_theme_color_changed_cb);
	if (vh->selectbox) {
		evas_object_del(vh->selectbox);
		vh->selectbox = NULL;
	}
	if (vh->crop_layout) {
		evas_object_del(vh->crop_layout);
		vh->crop_layout = NULL;
	}

	/* A crop applied on an earlier visit keeps the picture edited, as a
	 * rotation or an effect does. */
	if (vh->effect_applied || vh->rotated || vh->cropped)
		vh->edited = EINA_TRUE;
	else if (!vh->edited)
		elm_object_disabled_set(vh->done_btn, EINA_TRUE);

	elm_object_signal_emit(vh->layout, "elm,state,toolbar,show", "elm");

	ie_image_size_update(vh->main_image);
	ie_image_mode_set(vh->main_image, IE_IMAGE_MODE_NORMAL);
	ie_image_double_tap_enabled_set(EINA_TRUE, vh->main_image);

	elm_object_domain_translatable_part_text_set(vh->funcbar, "elm.text.title", IE_TEXT_DOMAIN, "IDS_ST_BODY_EDIT");
}
