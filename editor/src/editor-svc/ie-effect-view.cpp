/* The effect view: a strip of effect thumbnails beside the picture and an
 * intensity slider over it. A tap on a thumbnail runs its effect on the
 * full-size copy of the picture taken when the view opened (orig_buf); a
 * sideways drag over the picture blends that result (effect_buf) with the
 * copy at 0 to 100. The copy stays the base, so effects never stack.
 *
 * While the view is open the picture is always one of: orig_buf (nothing
 * picked yet), effect_buf (just picked), or their blend at
 * effect_last_alpha. A failed effect puts that picture back. */
#include <libintl.h>

#include <algorithm>
#include <cstring>

#include "editor-svc-private.h"
#include "ie-engine.h"
#include "ie-image.h"

namespace {

constexpr int ITEM_WIDTH = 120;
constexpr int ITEM_HEIGHT = 124;
constexpr int SLIDER_MAX = 100;
constexpr int SLIDER_MESSAGE_ID = 1;
/* A drag this long spans the whole intensity range. */
constexpr double DRAG_SPAN = 400.0;
/* Blur re-blends on every eleventh value, the others on every tenth. */
constexpr int BLUR_ROW = 5;
constexpr int BLUR_BLEND_STEP = 11;
constexpr int BLEND_STEP = 10;
/* Blending copies the unedited rows into the picture a band at a time, so
 * that the blend finds them still in cache. */
constexpr size_t BLEND_BAND_BYTES = 64 * 1024;
constexpr const char *TOUCH_PART = "elm.swallow.content.effect.subview.rect";

Ie_Data_Item *ie_data_new_item(void)
{
	auto *item = static_cast<Ie_Data_Item *>(calloc(1, sizeof(Ie_Data_Item)));
	IE_CHECK_NULL_AS(item, "item");
	return item;
}

int ie_data_free_item(Ie_Data_Item *item)
{
	IE_CHECK_VAL_AS(item, "item", -1);
	free(item);
	return 0;
}

int ie_data_clear_item_list(Eina_List **elist)
{
	IE_CHECK_VAL_AS(elist, "elist", -1);
	void *item;
	EINA_LIST_FREE(*elist, item)
		ie_data_free_item(static_cast<Ie_Data_Item *>(item));
	return 0;
}

Evas_Object *slider_edje(Viewhandle *vh)
{
	return vh->slider_layout ? elm_layout_edje_get(vh->slider_layout) : NULL;
}

/* The theme draws the value and reports it back as "slider_value_changed". */
void slider_value_send(Viewhandle *vh, int value)
{
	Evas_Object *edje = slider_edje(vh);
	if (!edje)
		return;
	Edje_Message_Int_Set message;
	message.count = 1;
	message.val[0] = value;
	edje_object_message_send(edje, EDJE_MESSAGE_INT_SET, SLIDER_MESSAGE_ID, &message);
	edje_object_signal_emit(edje, "increase,value", "");
}

void slider_name_set(Viewhandle *vh, int row)
{
	Evas_Object *edje = slider_edje(vh);
	if (edje)
		edje_object_part_text_set(edje, "effect-name",
					  row > 0 ? dgettext(IE_TEXT_DOMAIN, effect_table[row].text_id) : "");
}

Evas_Object *touch_area(Viewhandle *vh)
{
	if (!vh->layout)
		return NULL;
	return const_cast<Evas_Object *>(edje_object_part_object_get(elm_layout_edje_get(vh->layout), TOUCH_PART));
}

size_t picture_bytes(const Viewhandle *vh)
{
	return static_cast<size_t>(vh->image_width) * vh->image_height * 4;
}

/* The picture's pixels at the size of orig_buf, for writing all of them:
 * the main image's own buffer, written in place when the picture already
 * lies in it at that size. A picture Evas holds, or one shrunk by the
 * preview, is replaced by a new buffer of the main image's, so that a crop
 * after the effect also works in place. */
unsigned char *picture_pixels_reset(Viewhandle *vh)
{
	return static_cast<unsigned char *>(ie_image_own_pixels_get(vh->main_image, vh->image_width, vh->image_height));
}

void picture_pixels_commit(Viewhandle *vh, unsigned char *pixels, int w, int h)
{
	Evas_Object *inner = ie_image_object_get(vh->main_image);
	evas_object_image_data_set(inner, pixels);
	evas_object_image_data_update_add(inner, 0, 0, w, h);
}

/* pixels = orig_buf blended with effect_buf at `alpha` (0 to 100). */
void blend_into(Viewhandle *vh, unsigned char *pixels, float alpha)
{
	size_t row_bytes = static_cast<size_t>(vh->image_width) * 4;
	int band_rows = static_cast<int>(std::max<size_t>(1, BLEND_BAND_BYTES / row_bytes));
	for (int y = 0; y < vh->image_height; y += band_rows) {
		int rows = std::min(band_rows, vh->image_height - y);
		size_t offset = static_cast<size_t>(y) * row_bytes;
		memcpy(pixels + offset, vh->orig_buf + offset, rows * row_bytes);
		IEL_Image effect = {static_cast<uint32_t>(vh->image_width), static_cast<uint32_t>(rows),
				    IEL_FORMAT_BGRA8888, vh->effect_buf + offset};
		IEL_Image blended = {static_cast<uint32_t>(vh->image_width), static_cast<uint32_t>(rows),
				     IEL_FORMAT_BGRA8888, pixels + offset};
		IEL_Alpha_blending(&effect, &blended, alpha);
	}
}

/* Puts back the picture the view showed before a tap whose effect failed. */
void picture_restore(Viewhandle *vh)
{
	if (!vh->orig_buf)
		return;
	unsigned char *pixels = picture_pixels_reset(vh);
	if (!pixels)
		return;
	if (vh->effect_buf && vh->effect_last_alpha >= 0.0f)
		blend_into(vh, pixels, vh->effect_last_alpha);
	else
		memcpy(pixels, vh->effect_buf ? vh->effect_buf : vh->orig_buf, picture_bytes(vh));
	picture_pixels_commit(vh, pixels, vh->image_width, vh->image_height);
}

Elm_Object_Item *grid_item_of_row(Viewhandle *vh, int row)
{
	for (Elm_Object_Item *it = elm_gengrid_first_item_get(vh->effect_grid); it; it = elm_gengrid_item_next_get(it)) {
		auto *item = static_cast<Ie_Data_Item *>(elm_object_item_data_get(it));
		if (item && item->index == row)
			return it;
	}
	return NULL;
}

/* After a failed effect the pick goes back to the effect the picture
 * shows, so that the name, the selection and the drag agree with it. */
void pick_revert(Viewhandle *vh)
{
	int failed_row = vh->effect_index;
	vh->effect_index = vh->effect_buf ? vh->effect_buf_row : -1;
	slider_name_set(vh, vh->effect_index);
	if (!vh->effect_grid)
		return;
	Elm_Object_Item *shown = vh->effect_index > 0 ? grid_item_of_row(vh, vh->effect_index) : NULL;
	if (shown) {
		elm_gengrid_item_selected_set(shown, EINA_TRUE);
	} else {
		Elm_Object_Item *failed = grid_item_of_row(vh, failed_row);
		if (failed)
			elm_gengrid_item_selected_set(failed, EINA_FALSE);
	}
}

/* The coarse preview: the picked item's thumbnail in place of the picture,
 * drawn at once, before the full-size effect blocks the loop. */
void thumbnail_preview_show(Viewhandle *vh)
{
	Elm_Object_Item *selected = elm_gengrid_selected_item_get(vh->effect_grid);
	Evas_Object *thumb = selected ? elm_object_item_part_content_get(selected, "elm.swallow.icon") : NULL;
	int tw = 0, th = 0;
	if (thumb)
		evas_object_image_size_get(thumb, &tw, &th);
	const void *thumb_pixels = thumb ? evas_object_image_data_get(thumb, EINA_FALSE) : NULL;
	if (!thumb_pixels || tw != vh->thumb_width || th != vh->thumb_height)
		return;

	Evas_Object *inner = ie_image_object_get(vh->main_image);
	if (!inner)
		return;
	evas_object_image_data_set(inner, NULL);
	evas_object_image_size_set(inner, tw, th);
	void *pixels = evas_object_image_data_get(inner, EINA_TRUE);
	if (!pixels) {
		IE_LOG_E("evas_object_image_data_get Failed ");
		return;
	}
	memcpy(pixels, thumb_pixels, static_cast<size_t>(tw) * th * 4);
	evas_object_image_data_set(inner, pixels);
	evas_object_image_data_update_add(inner, 0, 0, tw, th);
	evas_render_updates_free(evas_render_updates(evas_object_evas_get(inner)));
}

Eina_Bool _update_from_thumbnail(void *data)
{
	auto *vh = static_cast<Viewhandle *>(data);
	vh->effect_update_idler = NULL;
	int row = vh->effect_index;
	if (row < 1 || row >= IE_EFFECT_TABLE_ROWS)
		return ECORE_CALLBACK_CANCEL;
	if (effect_table[row].thumbnail_preview)
		thumbnail_preview_show(vh);
	if (!generateEffect(vh, row)) {
		picture_restore(vh);
		pick_revert(vh);
	}
	return ECORE_CALLBACK_CANCEL;
}

void _effect_item_clicked_cb(void *data, Evas_Object *obj, void *)
{
	auto *item = static_cast<Ie_Data_Item *>(data);
	IE_CHECK_AS(item, "data");
	Viewhandle *vh = item->viewhandle;

	Elm_Object_Item *selected = elm_gengrid_selected_item_get(obj);
	if (selected)
		elm_object_item_signal_emit(selected, "select", "elm");
	if (item->index == vh->effect_index)
		return;

	vh->effect_index = item->index;
	slider_name_set(vh, item->index);
	/* Deferred so that the selection and the name are drawn first; a pick
	 * made before it runs is taken up by the same run. */
	if (!vh->effect_update_idler)
		vh->effect_update_idler = ecore_idler_add(_update_from_thumbnail, vh);
}

void _effect_item_unselected_cb(void *, Evas_Object *, void *event_info)
{
	elm_object_item_signal_emit(static_cast<Elm_Object_Item *>(event_info), "unselect", "elm");
}

void _effect_item_realized_cb(void *, Evas_Object *, void *event_info)
{
	auto *item = static_cast<Elm_Object_Item *>(event_info);
	elm_object_item_signal_emit(item, elm_gengrid_item_selected_get(item) ? "select" : "unselect", "elm");
}

void _effect_item_pressed_cb(void *, Evas_Object *, void *event_info)
{
	elm_object_item_signal_emit(static_cast<Elm_Object_Item *>(event_info), "pressed,item", "elm");
}

void _effect_on_item_selected(void *, Evas_Object *, void *event_info)
{
	IE_LOG_I("_effect_on_item_selected");
	auto *item = static_cast<Elm_Object_Item *>(event_info);
	if (elm_gengrid_item_selected_get(item))
		elm_object_item_signal_emit(item, "activated", "elm");
}

void _effect_item_released_cb(void *, Evas_Object *, void *event_info)
{
	elm_object_item_signal_emit(static_cast<Elm_Object_Item *>(event_info), "released,item", "elm");
}

void _on_effect_grid_del(void *data, Evas *, Evas_Object *, void *)
{
	auto *vh = static_cast<Viewhandle *>(data);
	IE_CHECK(data);
	if (vh->effect_itc) {
		elm_gengrid_item_class_free(vh->effect_itc);
		vh->effect_itc = NULL;
	}
}

Eina_Bool _effect_grid_update_position(void *data)
{
	auto *vh = static_cast<Viewhandle *>(data);
	IE_CHECK_VAL(data, ECORE_CALLBACK_CANCEL);
	vh->effect_grid_idler = NULL;
	if (!vh->effect_grid)
		return ECORE_CALLBACK_CANCEL;
	Elm_Object_Item *item = elm_gengrid_selected_item_get(vh->effect_grid);
	if (!item)
		item = elm_gengrid_first_item_get(vh->effect_grid);
	if (item)
		elm_gengrid_item_bring_in(item, ELM_GENGRID_ITEM_SCROLLTO_MIDDLE);
	return ECORE_CALLBACK_CANCEL;
}

void _effect_touch_down_cb(void *data, Evas *, Evas_Object *, void *event_info)
{
	auto *vh = static_cast<Viewhandle *>(data);
	auto *ev = static_cast<Evas_Event_Mouse_Down *>(event_info);
	vh->slider_touching = 0;
	vh->slider_drag_value = -1;
	if (!vh->effect_layout || !vh->effect_grid || !elm_gengrid_selected_item_get(vh->effect_grid)) {
		vh->slider_hidden = EINA_TRUE;
		return;
	}
	vh->touch_x = vh->touch_last_x = ev->output.x;
	vh->touch_y = ev->output.y;
	elm_object_signal_emit(vh->effect_layout, "elm,state,slider,show", "elm");
	vh->slider_hidden = EINA_FALSE;
	vh->slider_touching = 1;
	vh->slider_start_value = vh->slider_value;
}

void _effect_touch_move_cb(void *data, Evas *, Evas_Object *, void *event_info)
{
	auto *vh = static_cast<Viewhandle *>(data);
	auto *ev = static_cast<Evas_Event_Mouse_Move *>(event_info);
	if (vh->slider_hidden || vh->slider_touching <= 0)
		return;

	int x = ev->cur.output.x;
	int step = static_cast<int>((vh->touch_x - x) / DRAG_SPAN * 100.0);
	int value = vh->slider_start_value - step;
	if (value < 0 || value > SLIDER_MAX) {
		/* Past an end the drag starts again from where the finger is, so
		 * that turning back moves the value at once. */
		vh->touch_x = x;
		vh->slider_start_value = vh->slider_value;
		value = value < 0 ? 0 : SLIDER_MAX;
	}
	slider_value_send(vh, value);
	vh->slider_drag_value = value;

	int blend_step = vh->effect_index == BLUR_ROW ? BLUR_BLEND_STEP : BLEND_STEP;
	if (value % blend_step == 0)
		generateEffectAlpha(vh, static_cast<float>(value));
}

void _effect_touch_up_cb(void *data, Evas *, Evas_Object *, void *)
{
	auto *vh = static_cast<Viewhandle *>(data);
	vh->slider_touching = 0;
	if (vh->slider_hidden)
		return;
	elm_object_signal_emit(vh->effect_layout, "elm,state,slider,hide", "elm");
	vh->slider_start_value = vh->slider_value;
	/* Moves blend only at every tenth value: the release makes the picture
	 * show the value the slider shows. */
	if (vh->slider_drag_value >= 0)
		generateEffectAlpha(vh, static_cast<float>(vh->slider_drag_value));
	vh->slider_drag_value = -1;
}

void _slider_value_changed_cb(void *data, Evas_Object *, const char *emission, const char *)
{
	auto *vh = static_cast<Viewhandle *>(data);
	char *end = NULL;
	long value = emission ? strtol(emission, &end, 10) : 0;
	if (end && end != emission)
		vh->slider_value = static_cast<int32_t>(value);
}

Eina_Bool effect_grid_fill(Viewhandle *vh)
{
	ie_data_clear_item_list(&vh->effect_items);
	for (int row = 1; row < IE_EFFECT_TABLE_ROWS; row++) {
		Ie_Data_Item *item = ie_data_new_item();
		if (!item) {
			IE_LOG_E("new item failed, continue!");
			continue;
		}
		item->viewhandle = vh;
		item->index = row;
		vh->effect_items = eina_list_append(vh->effect_items, item);
	}

	Eina_List *node;
	void *data;
	EINA_LIST_FOREACH(vh->effect_items, node, data) {
		if (!elm_gengrid_item_append(vh->effect_grid, vh->effect_itc, data, _effect_item_clicked_cb, data)) {
			IE_LOG_E("append error");
			return EINA_FALSE;
		}
	}
	return EINA_TRUE;
}

} // namespace

void ie_effect_touch_callbacks_del(Viewhandle *vh)
{
	Evas_Object *area = touch_area(vh);
	if (!area)
		return;
	evas_object_event_callback_del_full(area, EVAS_CALLBACK_MOUSE_DOWN, _effect_touch_down_cb, vh);
	evas_object_event_callback_del_full(area, EVAS_CALLBACK_MOUSE_UP, _effect_touch_up_cb, vh);
	evas_object_event_callback_del_full(area, EVAS_CALLBACK_MOUSE_MOVE, _effect_touch_move_cb, vh);
}

void ie_effect_grid_update_position_add(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	if (!vh->effect_grid_idler)
		vh->effect_grid_idler = ecore_idler_add(_effect_grid_update_position, vh);
}

Eina_Bool generateEffect(Viewhandle *vh, int row)
{
	IE_CHECK_VAL_AS(vh, "data", EINA_FALSE);
	elm_object_disabled_set(vh->done_btn, EINA_FALSE);
	if (!vh->orig_buf) {
		IE_LOG_E("the picture was not copied when the view opened");
		return EINA_FALSE;
	}

	/* The result becomes effect_buf as it is; the previous one stays until
	 * the new one is on the picture. */
	unsigned char *result = ie_effect_buffer_new(picture_bytes(vh));
	if (!result) {
		IE_LOG_E("Output.pbBuf is null Calloc Failed");
		return EINA_FALSE;
	}
	IEL_Image source = {static_cast<uint32_t>(vh->image_width), static_cast<uint32_t>(vh->image_height),
			    IEL_FORMAT_BGRA8888, vh->orig_buf};
	IEL_Image output = {static_cast<uint32_t>(vh->image_width), static_cast<uint32_t>(vh->image_height),
			    IEL_FORMAT_BGRA8888, result};
	if (!ie_effect_run(&source, &output, row)) {
		IE_LOG_E("the effect of row %d failed", row);
		free(result);
		return EINA_FALSE;
	}

	unsigned char *pixels = picture_pixels_reset(vh);
	if (!pixels) {
		free(result);
		return EINA_FALSE;
	}
	memcpy(pixels, result, picture_bytes(vh));
	picture_pixels_commit(vh, pixels, vh->image_width, vh->image_height);

	free(vh->effect_buf);
	vh->effect_buf = result;
	vh->effect_buf_row = row;
	/* A new effect shows at full intensity: any value may blend again. */
	vh->effect_last_alpha = IE_EFFECT_NO_ALPHA;
	vh->edited = EINA_TRUE;
	slider_value_send(vh, SLIDER_MAX);
	vh->effect_applied = EINA_TRUE;
	return EINA_TRUE;
}

void generateEffectAlpha(Viewhandle *vh, float alpha)
{
	IE_CHECK_AS(vh, "data");
	if (alpha == vh->effect_last_alpha || alpha < 0.0f || alpha > SLIDER_MAX)
		return;

	Evas_Object *inner = ie_image_object_get(vh->main_image);
	int w = 0, h = 0;
	if (inner)
		evas_object_image_size_get(inner, &w, &h);
	/* Without the view's buffers, or with a picture of another size than
	 * they hold, there is nothing to blend. */
	if (!vh->orig_buf || !vh->effect_buf || w != vh->image_width || h != vh->image_height)
		return;
	auto *pixels = static_cast<unsigned char *>(ie_image_data_get(vh->main_image));
	if (!pixels) {
		IE_LOG_E("buf is null");
		return;
	}
	IE_LOG_I("the alpha is %f", alpha);
	blend_into(vh, pixels, alpha);
	picture_pixels_commit(vh, pixels, w, h);
	vh->effect_last_alpha = alpha;
}

void ie_create_effect_view(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	Eina_Bool portrait = ie_rotation_is_portrait(ie_window_rotation_get());

	ie_image_refit(vh->main_image);
	ie_image_zoom_enabled_set(vh->main_image, EINA_FALSE);
	ie_image_double_tap_enabled_set(EINA_FALSE, vh->main_image);
	if (vh->layout)
		elm_object_signal_emit(vh->layout, portrait ? "effect,portrait" : "effect,landscape", "elm");

	/* Nothing is picked in a new view, also when the last one was left
	 * through another tool: a pick of the same effect must run again. */
	vh->effect_index = -1;
	vh->effect_buf_row = -1;
	vh->effect_last_alpha = IE_EFFECT_NO_ALPHA;
	vh->slider_drag_value = -1;
	SetThumbnailBuffer(vh);

	Elm_Gengrid_Item_Class *itc = elm_gengrid_item_class_new();
	if (!itc) {
		IE_LOG_E("Effect item class cannot be created");
		return;
	}
	itc->item_style = "imageeditor/effectgrid";
	itc->func.text_get = _effect_text_get;
	itc->func.content_get = _effect_content_get;
	itc->func.state_get = NULL;
	itc->func.del = NULL;
	vh->effect_itc = itc;

	Evas_Object *grid = elm_gengrid_add(vh->naviframe);
	if (!grid) {
		IE_LOG_E("the effect grid cannot be created");
		elm_gengrid_item_class_free(itc);
		vh->effect_itc = NULL;
		return;
	}
	/* Set at once: a view that stops half-built still counts as open, so
	 * the effect tool and the close take it down again. */
	vh->effect_grid = grid;
	evas_object_size_hint_weight_set(grid, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	evas_object_size_hint_align_set(grid, EVAS_HINT_FILL, EVAS_HINT_FILL);
	elm_scroller_policy_set(grid, ELM_SCROLLER_POLICY_OFF, ELM_SCROLLER_POLICY_OFF);
	elm_gengrid_select_mode_set(grid, ELM_OBJECT_SELECT_MODE_ALWAYS);
	evas_object_smart_callback_add(grid, "unselected", _effect_item_unselected_cb, NULL);
	evas_object_smart_callback_add(grid, "realized", _effect_item_realized_cb, NULL);
	evas_object_smart_callback_add(grid, "pressed", _effect_item_pressed_cb, NULL);
	evas_object_smart_callback_add(grid, "selected", _effect_on_item_selected, NULL);
	evas_object_smart_callback_add(grid, "released", _effect_item_released_cb, NULL);
	evas_object_event_callback_add(grid, EVAS_CALLBACK_DEL, _on_effect_grid_del, vh);
	evas_object_show(grid);

	if (!effect_grid_fill(vh))
		return;

	elm_gengrid_align_set(grid, 0.5, 0.5);
	elm_gengrid_horizontal_set(grid, portrait);
	elm_gengrid_item_size_set(grid, ITEM_WIDTH, ITEM_HEIGHT);
	elm_scroller_bounce_set(grid, EINA_FALSE, EINA_FALSE);
	elm_object_part_content_set(vh->layout, "elm.swallow.effecttray", grid);

	vh->effect_layout = create_layout(vh->layout, "iv-effect-slider");
	if (!vh->effect_layout) {
		IE_LOG_E("Cannot create layout");
		return;
	}
	evas_object_show(vh->effect_layout);

	Evas_Object *area = touch_area(vh);
	IE_LOG_E("mRect=0x%08x", static_cast<unsigned int>(reinterpret_cast<uintptr_t>(area)));
	if (area) {
		evas_object_name_set(area, "effect_touch_layout");
		evas_object_event_callback_add(area, EVAS_CALLBACK_MOUSE_DOWN, _effect_touch_down_cb, vh);
		evas_object_event_callback_add(area, EVAS_CALLBACK_MOUSE_UP, _effect_touch_up_cb, vh);
		evas_object_event_callback_add(area, EVAS_CALLBACK_MOUSE_MOVE, _effect_touch_move_cb, vh);
	}

	vh->slider_layout = create_layout(vh->effect_layout, "iv-slider-layout");
	if (!vh->slider_layout) {
		IE_LOG_E("Cannot create layout");
		return;
	}
	edje_object_signal_callback_add(elm_layout_edje_get(vh->slider_layout), "*", "slider_value_changed",
					_slider_value_changed_cb, vh);
	evas_object_show(vh->slider_layout);
	elm_object_part_content_set(vh->effect_layout, "slider_area", vh->slider_layout);
	evas_object_show(vh->effect_layout);
	elm_object_part_content_set(vh->layout, "elm.swallow.content.effect.subview", vh->effect_layout);

	slider_value_send(vh, SLIDER_MAX);
	elm_object_signal_emit(vh->slider_layout, portrait ? "elm,state,slider,default" : "elm,state,slider,landscape",
			       "elm");
	ie_effect_grid_update_position_add(vh);
}

void ie_delete_effect_view(Viewhandle *vh)
{
	IE_LOG_I("ie_delete_effect_view");
	IE_CHECK_AS(vh, "data");

	/* Nothing deferred may run on a closed view. */
	if (vh->effect_update_idler) {
		ecore_idler_del(vh->effect_update_idler);
		vh->effect_update_idler = NULL;
	}
	if (vh->effect_grid_idler) {
		ecore_idler_del(vh->effect_grid_idler);
		vh->effect_grid_idler = NULL;
	}

	ie_image_zoom_enabled_set(vh->main_image, EINA_TRUE);
	ie_image_double_tap_enabled_set(EINA_TRUE, vh->main_image);
	ie_effect_touch_callbacks_del(vh);
	vh->slider_touching = 0;
	if (vh->layout)
		elm_object_signal_emit(vh->layout, "elm,state,effect,view,hide", "elm");

	/* The grid's items point at the item records: the grid goes first. */
	if (vh->effect_grid) {
		elm_gengrid_clear(vh->effect_grid);
		evas_object_del(vh->effect_grid);
		vh->effect_grid = NULL;
	}
	ie_data_clear_item_list(&vh->effect_items);

	free(vh->orig_buf);
	vh->orig_buf = NULL;
	free(vh->effect_buf);
	vh->effect_buf = NULL;
	free(vh->thumb_buf);
	vh->thumb_buf = NULL;
}
