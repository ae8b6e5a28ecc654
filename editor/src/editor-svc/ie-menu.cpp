/* What Cancel, Done and the back key do in each view, and the editor's
 * popups (discard changes; not enough memory; could not save; saving). */
#include <algorithm>
#include <cstdlib>

#include <app_launch.h>
#include <gadget_window.h>

#include "editor-svc-private.h"
#include "ie-engine.h"
#include "ie-image.h"
#include "ie-save.h"
#include "ie-selectbox.h"

#define IE_STORAGE_SETTINGS_APP_ID "setting-storage-efl"
/* A registration quicker than this shows no processing popup. */
#define IE_SAVE_POPUP_DELAY 0.3

static void buttons_disabled_set(Viewhandle *vh, Eina_Bool disabled)
{
	if (vh->cancel_btn)
		elm_object_disabled_set(vh->cancel_btn, disabled);
	if (vh->done_btn)
		elm_object_disabled_set(vh->done_btn, disabled);
}

void _popup_close(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	if (vh->popup) {
		evas_object_del(vh->popup);
		vh->popup = NULL;
	}
	buttons_disabled_set(vh, EINA_FALSE);
}

static void _popup_cancel_cb(void *data, Evas_Object *, void *)
{
	_popup_close(static_cast<Viewhandle *>(data));
}

static void _popup_back_cb(void *data, Evas_Object *, void *)
{
	_popup_close(static_cast<Viewhandle *>(data));
}

static void _popup_discard_cb(void *data, Evas_Object *, void *)
{
	auto *vh = static_cast<Viewhandle *>(data);
	IE_CHECK(data);
	_popup_close(vh);
	evas_object_smart_callback_call(vh->layout, "delete,me", NULL);
}

static void launch_storage_settings(void)
{
	App_Request *request = NULL;
	int ret = app_control_create(&request);
	if (ret == APP_LAUNCH_ERROR_NONE)
		ret = app_control_set_operation(request, APP_LAUNCH_OPERATION_VIEW);
	if (ret == APP_LAUNCH_ERROR_NONE)
		ret = app_control_set_window(request, elm_win_xwindow_get(ug_get_window()));
	if (ret == APP_LAUNCH_ERROR_NONE)
		ret = app_control_set_app_id(request, IE_STORAGE_SETTINGS_APP_ID);
	if (ret == APP_LAUNCH_ERROR_NONE)
		app_control_send_launch_request(request, NULL, NULL);
	if (request)
		app_control_destroy(request);
}

static void _popup_storage_ok_cb(void *data, Evas_Object *, void *)
{
	auto *vh = static_cast<Viewhandle *>(data);
	IE_CHECK(data);
	_popup_close(vh);
	launch_storage_settings();
}

static void popup_button_add(Viewhandle *vh, Evas_Object *popup, const char *part, const char *text_id,
			     Evas_Smart_Cb clicked)
{
	Evas_Object *button = elm_button_add(popup);
	elm_object_style_set(button, "popup");
	elm_object_domain_translatable_text_set(button, IE_TEXT_DOMAIN, text_id);
	evas_object_propagate_events_set(button, EINA_FALSE);
	evas_object_smart_callback_add(button, "clicked", clicked, vh);
	elm_object_part_content_set(popup, part, button);
}

/* Shows a popup at the bottom, full width, with Cancel and Done disabled
 * while it is up. */
static Evas_Object *popup_open(Viewhandle *vh, const char *name, const char *title_id, const char *body_id)
{
	_popup_close(vh);
	buttons_disabled_set(vh, EINA_TRUE);
	Evas_Object *popup = elm_popup_add(vh->naviframe);
	elm_object_style_set(popup, "image-editor");
	elm_popup_align_set(popup, ELM_NOTIFY_ALIGN_FILL, 1.0);
	evas_object_size_hint_weight_set(popup, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	evas_object_name_set(popup, name);
	if (title_id)
		elm_object_domain_translatable_part_text_set(popup, "title,text", IE_TEXT_DOMAIN, title_id);
	elm_object_domain_translatable_text_set(popup, IE_TEXT_DOMAIN, body_id);
	ea_object_event_callback_add(popup, EA_CALLBACK_BACK, _popup_back_cb, vh);
	vh->popup = popup;
	return popup;
}

static void show_discard_popup(Viewhandle *vh)
{
	Evas_Object *popup = popup_open(vh, "deletepopup", "IDS_CLD_HEADER_DISCARD_CHANGES_ABB",
					"IDS_CLD_POP_ALL_CHANGES_WILL_BE_DISCARDED");
	popup_button_add(vh, popup, "button1", "IDS_IV_BUTTON_CANCEL", _popup_cancel_cb);
	popup_button_add(vh, popup, "button2", "IDS_IV_SK_DISCARD", _popup_discard_cb);
	evas_object_show(popup);
}

static void show_memory_popup(Viewhandle *vh)
{
	Evas_Object *popup = popup_open(vh, "okcancelpopup", NULL, "IDS_MF_POP_NOT_ENOUGH_MEMORY_DELETE_SOME_ITEMS");
	popup_button_add(vh, popup, "button1", "IDS_MEDIABR_BUTTON_OK", _popup_storage_ok_cb);
	popup_button_add(vh, popup, "button2", "IDS_IV_BUTTON_CANCEL", _popup_cancel_cb);
	evas_object_show(popup);
}

static void show_save_failed_popup(Viewhandle *vh)
{
	Evas_Object *popup = popup_open(vh, "savefailedpopup", NULL, "IDS_IV_POP_UNABLE_TO_SAVE_PICTURE");
	popup_button_add(vh, popup, "button1", "IDS_MEDIABR_BUTTON_OK", _popup_cancel_cb);
	evas_object_show(popup);
}

static void back_to_main_view(Viewhandle *vh)
{
	ie_view_mgr_set_view(IE_VIEW_TYPE_MAIN, vh);
	Elm_Object_Item *selected = vh->toolbar ? elm_gengrid_selected_item_get(vh->toolbar) : NULL;
	if (selected)
		elm_object_item_signal_emit(selected, "unselect", "elm");
	ie_image_refit(vh->main_image);
}

/* Replaces the picture by its part under the selection rectangle, mapped
 * from canvas coordinates over the displayed picture to its pixels. Only the
 * part of the rectangle over the picture counts, and at least one pixel of
 * it: a rectangle beside the picture leaves the picture as it is. */
void __apply_crop(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	if (!vh->selectbox)
		return;
	Evas_Coord sx, sy, sw, sh;
	ie_selectbox_get_region(vh->selectbox, &sx, &sy, &sw, &sh);

	Evas_Object *img = ie_image_object_get(vh->main_image);
	int iw = 0, ih = 0;
	evas_object_image_size_get(img, &iw, &ih);
	Evas_Coord dx, dy, dw, dh;
	ie_image_geometry_get(vh->main_image, &dx, &dy, &dw, &dh);
	const Evas_Coord left = std::max(sx, dx), top = std::max(sy, dy);
	const Evas_Coord right = std::min(sx + sw, dx + dw), bottom = std::min(sy + sh, dy + dh);
	if (iw <= 0 || ih <= 0 || right <= left || bottom <= top)
		return;

	const float kx = static_cast<float>(iw) / dw;
	const float ky = static_cast<float>(ih) / dh;
	const int x0 = std::clamp(static_cast<int>((left - dx) * kx), 0, iw - 1);
	const int y0 = std::clamp(static_cast<int>((top - dy) * ky), 0, ih - 1);
	const int cw = std::clamp(static_cast<int>((right - left) * kx), 1, iw - x0);
	const int ch = std::clamp(static_cast<int>((bottom - top) * ky), 1, ih - y0);

	auto *pixels = static_cast<uint8_t *>(ie_image_data_get(vh->main_image));
	if (!pixels) {
		IE_LOG_E("Image Internal Buffer Get Failed");
		return;
	}
	/* The region goes on screen without another copy: the main image takes
	 * it over. A picture in the main image's own buffer (loaded reduced or
	 * turned upright, or cropped before) is cropped where it lies; one
	 * that Evas holds is copied out once, into memory that is not
	 * zero-filled first since the crop writes every byte. */
	const bool in_place = ie_image_pixels_owned(vh->main_image, pixels);
	uint8_t *cropped = in_place ? pixels : static_cast<uint8_t *>(malloc(static_cast<size_t>(cw) * ch * 4));
	if (!cropped) {
		evas_object_image_data_set(img, pixels);
		IE_LOG_E("Output.pbBuf is null calloc Failed ");
		return;
	}
	IEL_Image source = {static_cast<uint32_t>(iw), static_cast<uint32_t>(ih), IEL_FORMAT_BGRA8888, pixels};
	IEL_Image region = {static_cast<uint32_t>(cw), static_cast<uint32_t>(ch), IEL_FORMAT_BGRA8888, cropped};
	if (IEL_Crop_Image(&source, &region, x0, y0) != IEL_OK) {
		evas_object_image_data_set(img, pixels);
		if (!in_place)
			free(cropped);
		return;
	}
	if (!ie_image_pixels_take(vh->main_image, cropped, cw, ch))
		return;
	vh->edited = EINA_TRUE;
	vh->cropped = EINA_TRUE;
}

void _on_menu_cancel(void *data, Evas_Object *, void *)
{
	auto *vh = static_cast<Viewhandle *>(data);
	IE_CHECK(data);
	// The picture is saved: the editor closes with it once registered.
	if (vh->save_registration)
		return;

	_popup_close(vh);
	int view = ie_view_mgr_get_current_view();
	if (vh->edited) {
		show_discard_popup(vh);
		return;
	}
	switch (view) {
	case IE_VIEW_TYPE_MAIN:
	case IE_VIEW_TYPE_EFFECT:
	case IE_VIEW_TYPE_ROTATE_LEFT:
	case IE_VIEW_TYPE_ROTATE_RIGHT:
		evas_object_smart_callback_call(vh->layout, "delete,me", NULL);
		break;
	case IE_VIEW_TYPE_UNDEF:
	case IE_VIEW_TYPE_CROP:
		back_to_main_view(vh);
		break;
	default:
		break;
	}
}

static void save_popup_close(Viewhandle *vh)
{
	if (vh->save_popup_timer) {
		ecore_timer_del(vh->save_popup_timer);
		vh->save_popup_timer = NULL;
	}
	if (vh->save_popup) {
		evas_object_del(vh->save_popup);
		vh->save_popup = NULL;
	}
}

static Eina_Bool _save_popup_timer_cb(void *data)
{
	auto *vh = static_cast<Viewhandle *>(data);
	vh->save_popup_timer = NULL;
	vh->save_popup = ie_processing_popup_add(vh->naviframe, "IDS_IV_TPOP_SAVING_ING");
	return ECORE_CALLBACK_CANCEL;
}

static void _on_save_registered(void *data, char *path)
{
	auto *vh = static_cast<Viewhandle *>(data);
	vh->save_registration = NULL;
	save_popup_close(vh);
	evas_object_smart_callback_call(vh->layout, "delete,me", path);
}

/* A failed save keeps the editor open with the edit, so the user can free
 * some room or simply try again. */
static void save_and_close(Viewhandle *vh)
{
	Eina_Bool memory_full = EINA_FALSE;
	char *path = _save_to_file(ie_image_object_get(vh->main_image), &memory_full);
	if (!path) {
		if (memory_full)
			show_memory_popup(vh);
		else
			show_save_failed_popup(vh);
		return;
	}
	// The database may be held by another process: the main loop goes on
	// meanwhile, with the editor waiting for it and taking no more edits,
	// which the saved file would not have.
	vh->save_registration = ie_save_register(path, _on_save_registered, vh);
	if (!vh->save_registration) {
		evas_object_smart_callback_call(vh->layout, "delete,me", path);
		return;
	}
	buttons_disabled_set(vh, EINA_TRUE);
	if (vh->toolbar)
		evas_object_pass_events_set(vh->toolbar, EINA_TRUE);
	vh->save_popup_timer = ecore_timer_add(IE_SAVE_POPUP_DELAY, _save_popup_timer_cb, vh);
}

void _save_flow_release(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	ie_save_register_abandon(vh->save_registration);
	vh->save_registration = NULL;
	save_popup_close(vh);
}

void _on_menu_done(void *data, Evas_Object *, void *)
{
	auto *vh = static_cast<Viewhandle *>(data);
	IE_CHECK(data);

	if (vh->save_registration)
		return;
	switch (ie_view_mgr_get_current_view()) {
	case IE_VIEW_TYPE_MAIN:
	case IE_VIEW_TYPE_EFFECT:
	case IE_VIEW_TYPE_ROTATE_LEFT:
	case IE_VIEW_TYPE_ROTATE_RIGHT:
		ie_view_mgr_set_view(IE_VIEW_TYPE_MAIN, vh);
		if (vh->edited)
			save_and_close(vh);
		break;
	case IE_VIEW_TYPE_CROP:
		__apply_crop(vh);
		back_to_main_view(vh);
		break;
	default:
		IE_LOG_I("Undef View ");
		break;
	}
}
