/* The function bar (title, Cancel, Done) and the tool bar (crop, rotate
 * left, rotate right, effects), kept in step with the window orientation. */
#include <gadget_window.h>

#include "editor-svc-private.h"
#include "ie-image.h"
#include "ie-selectbox.h"

namespace {

enum {
	IE_TOOL_CROP,
	IE_TOOL_ROTATE_LEFT,
	IE_TOOL_ROTATE_RIGHT,
	IE_TOOL_EFFECT,
	IE_TOOL_COUNT
};

struct Toolbar_Item {
	int32_t index;
	Elm_Object_Item *item;
	Viewhandle *vh;
};

/* One editor at a time: the tool records are the item callbacks' data. */
Toolbar_Item toolbar_items[IE_TOOL_COUNT];

constexpr const char *tool_icons[IE_TOOL_COUNT] = {
	RES_DIR "/images//image_viewer_btn_ic_crop.png",
	RES_DIR "/images//image_viewer_btn_ic_rotation_left.png",
	RES_DIR "/images//image_viewer_btn_ic_rotation_right.png",
	RES_DIR "/images//image_viewer_btn_ic_effect.png",
};

void toolbar_orientation_apply(Viewhandle *vh, Eina_Bool portrait, Eina_Bool with_signals)
{
	if (portrait) {
		elm_gengrid_horizontal_set(vh->toolbar, EINA_TRUE);
		elm_gengrid_item_size_set(vh->toolbar, 120, 100);
	} else {
		elm_gengrid_horizontal_set(vh->toolbar, EINA_FALSE);
		elm_gengrid_item_size_set(vh->toolbar, 100, 102);
	}
	if (!with_signals)
		return;
	elm_object_signal_emit(vh->layout, portrait ? "toolbar,portrait" : "toolbar,landscape", "elm");
	elm_object_signal_emit(vh->layout, portrait ? "pre,effect,portrait" : "pre,effect,landscape", "elm");
}

void emit_on_selected_tool(Viewhandle *vh, const char *signal)
{
	Elm_Object_Item *selected = vh->toolbar ? elm_gengrid_selected_item_get(vh->toolbar) : NULL;
	if (selected)
		elm_object_item_signal_emit(selected, signal, "elm");
}

} // namespace

void create_funcbar(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "Viewhandle");
	IE_CHECK_AS(vh->layout, "Viewhandle->layout");

	vh->funcbar = create_layout(vh->layout, "iv-funcbar");
	if (!vh->funcbar) {
		IE_LOG_E("Cannot create funcbar");
		return;
	}
	evas_object_name_set(vh->funcbar, "Top Toolbar");

	Evas_Object *cancel = elm_button_add(vh->funcbar);
	elm_object_style_set(cancel, "naviframe/title_text_left");
	evas_object_smart_callback_add(cancel, "clicked", _on_menu_cancel, vh);
	evas_object_show(cancel);
	elm_object_part_content_set(vh->funcbar, "title_left_text_btn", cancel);
	elm_object_domain_translatable_text_set(cancel, IE_TEXT_DOMAIN, "IDS_TPLATFORM_ACBUTTON_CANCEL_ABB");
	vh->cancel_btn = cancel;

	Evas_Object *done = elm_button_add(vh->funcbar);
	elm_object_style_set(done, "naviframe/title_text_right");
	evas_object_smart_callback_add(done, "clicked", _on_menu_done, vh);
	evas_object_show(done);
	elm_object_part_content_set(vh->funcbar, "title_right_text_btn", done);
	elm_object_domain_translatable_text_set(done, IE_TEXT_DOMAIN, "IDS_TPLATFORM_ACBUTTON_DONE_ABB");
	vh->done_btn = done;

	elm_object_disabled_set(done, EINA_TRUE);
	elm_object_disabled_set(cancel, EINA_FALSE);

	elm_object_domain_translatable_part_text_set(vh->funcbar, "elm.text.title", IE_TEXT_DOMAIN, "IDS_ST_BODY_EDIT");
	elm_object_part_content_set(vh->layout, "elm.swallow.tabbar", vh->funcbar);
}

static Evas_Object *_toolbar_content_get(void *data, Evas_Object *obj, const char *part)
{
	if (!part || strcmp(part, "elm.swallow.icon"))
		return NULL;
	if (!data) {
		IE_LOG_E("path is null..!!");
		return NULL;
	}
	Evas_Object *icon = elm_image_add(obj);
	elm_image_file_set(icon, static_cast<const char *>(data), NULL);
	return icon;
}

static void _toolbar_pressed_cb(void *, Evas_Object *, void *event_info)
{
	elm_object_item_signal_emit(static_cast<Elm_Object_Item *>(event_info), "pressed,toolbar,item", "elm");
}

static void _toolbar_released_cb(void *, Evas_Object *, void *event_info)
{
	elm_object_item_signal_emit(static_cast<Elm_Object_Item *>(event_info), "released,toolbar,item", "elm");
}

static void _toolbar_unselected_cb(void *, Evas_Object *, void *event_info)
{
	elm_object_item_signal_emit(static_cast<Elm_Object_Item *>(event_info), "unselect", "elm");
}

static void _toolbar_realized_cb(void *, Evas_Object *, void *event_info)
{
	auto *item = static_cast<Elm_Object_Item *>(event_info);
	elm_object_item_signal_emit(item, elm_gengrid_item_selected_get(item) ? "select" : "unselect", "elm");
}

static void _on_toolbar_del(void *data, Evas *, Evas_Object *, void *)
{
	auto *vh = static_cast<Viewhandle *>(data);
	IE_CHECK(data);
	if (vh->toolbar_itc) {
		elm_gengrid_item_class_free(vh->toolbar_itc);
		vh->toolbar_itc = NULL;
	}
}

static void _on_menu_crop(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	vh->edited = EINA_FALSE;
	elm_object_signal_emit(vh->layout, "elm,state,toolbar,hide", "elm");
	ie_view_mgr_set_view(IE_VIEW_TYPE_CROP, vh);
	Evas_Coord w = 0, h = 0;
	evas_object_geometry_get(ug_get_window(), NULL, NULL, &w, &h);
	vh->width = w;
	vh->height = h;
}

static void _on_menu_rotate(Viewhandle *vh, int view, Elm_Object_Item *item)
{
	IE_CHECK_AS(vh, "data");
	ie_view_mgr_set_view(view, vh);
	if (item)
		elm_object_item_signal_emit(item, "unselect", "elm");
}

static void _on_menu_effect(Viewhandle *vh)
{
	IE_LOG_I("Menu : _on_menu_effect");
	IE_CHECK_AS(vh, "data");
	if (vh->effect_grid) {
		ie_view_mgr_set_view(IE_VIEW_TYPE_MAIN, vh);
		emit_on_selected_tool(vh, "unselect");
		vh->effect_index = -1;
	} else {
		ie_view_mgr_set_view(IE_VIEW_TYPE_EFFECT, vh);
	}
}

static void _grid_toolbar_clicked_cb(void *data, Evas_Object *obj, void *)
{
	auto *tool = static_cast<Toolbar_Item *>(data);
	Elm_Object_Item *item = elm_gengrid_selected_item_get(obj);
	IE_LOG_E("grid is clicked");
	if (item)
		elm_object_item_signal_emit(item, "select", "elm");

	switch (tool->index) {
	case IE_TOOL_CROP:
		_on_menu_crop(tool->vh);
		break;
	case IE_TOOL_ROTATE_LEFT:
		_on_menu_rotate(tool->vh, IE_VIEW_TYPE_ROTATE_LEFT, item);
		break;
	case IE_TOOL_ROTATE_RIGHT:
		_on_menu_rotate(tool->vh, IE_VIEW_TYPE_ROTATE_RIGHT, item);
		break;
	case IE_TOOL_EFFECT:
		_on_menu_effect(tool->vh);
		break;
	}
}

void create_gengrid_toolbar(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "Viewhandle");
	IE_CHECK_AS(vh->layout, "Viewhandle->layout");

	Evas_Object *grid = elm_gengrid_add(vh->naviframe);
	elm_gengrid_align_set(grid, 0.5, 0.5);
	elm_scroller_bounce_set(grid, EINA_FALSE, EINA_FALSE);
	vh->toolbar = grid;

	vh->win_rotation = ie_window_rotation_get();
	toolbar_orientation_apply(vh, ie_rotation_is_portrait(vh->win_rotation), EINA_FALSE);

	elm_gengrid_select_mode_set(grid, ELM_OBJECT_SELECT_MODE_ALWAYS);
	evas_object_size_hint_weight_set(grid, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	evas_object_size_hint_align_set(grid, EVAS_HINT_FILL, EVAS_HINT_FILL);
	evas_object_show(grid);

	vh->toolbar_itc = elm_gengrid_item_class_new();
	if (!vh->toolbar_itc) {
		IE_LOG_E("the toolbar item class was not created");
		return;
	}
	vh->toolbar_itc->item_style = "marlune/iv_view";
	vh->toolbar_itc->func.text_get = NULL;
	vh->toolbar_itc->func.content_get = _toolbar_content_get;
	vh->toolbar_itc->func.state_get = NULL;
	vh->toolbar_itc->func.del = NULL;

	for (int index = 0; index < IE_TOOL_COUNT; index++) {
		Toolbar_Item *tool = &toolbar_items[index];
		tool->index = index;
		tool->vh = vh;
		tool->item = elm_gengrid_item_append(grid, vh->toolbar_itc, tool_icons[index], _grid_toolbar_clicked_cb, tool);
		if (!tool->item)
			IE_LOG_E("APpend error");
	}

	evas_object_smart_callback_add(grid, "unselected", _toolbar_unselected_cb, NULL);
	evas_object_smart_callback_add(grid, "pressed", _toolbar_pressed_cb, NULL);
	evas_object_smart_callback_add(grid, "released", _toolbar_released_cb, NULL);
	evas_object_smart_callback_add(grid, "realized", _toolbar_realized_cb, NULL);
	evas_object_event_callback_add(grid, EVAS_CALLBACK_DEL, _on_toolbar_del, vh);

	elm_object_part_content_set(vh->layout, "elm.swallow.ctrlbar", grid);
}

void ie_set_main_view_text(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");
	if (vh->effect_layout) {
		evas_object_del(vh->effect_layout);
		vh->effect_layout = NULL;
		/* The slider was the effect layout's content. */
		vh->slider_layout = NULL;
	}
	ie_effect_touch_callbacks_del(vh);
	elm_object_signal_emit(vh->layout, "elm,state,effect,view,hide", "elm");
	if (vh->toolbar)
		toolbar_orientation_apply(vh, ie_rotation_is_portrait(ie_window_rotation_get()), EINA_TRUE);
}

void _on_layout_resized(void *data, Evas *, Evas_Object *, void *)
{
	auto *vh = static_cast<Viewhandle *>(data);
	IE_CHECK(data);

	Eina_Bool portrait = ie_rotation_is_portrait(ie_window_rotation_get());
	Evas_Coord w = 0, h = 0;
	evas_object_geometry_get(ug_get_window(), NULL, NULL, &w, &h);
	if (vh->toolbar)
		toolbar_orientation_apply(vh, portrait, EINA_TRUE);
	vh->width = w;
	vh->height = h;

	switch (ie_view_mgr_get_current_view()) {
	case IE_VIEW_TYPE_EFFECT:
		if (vh->layout && vh->effect_grid) {
			elm_gengrid_horizontal_set(vh->effect_grid, portrait);
			elm_object_signal_emit(vh->layout, portrait ? "effect,portrait" : "effect,landscape", "elm");
			if (vh->slider_layout)
				elm_object_signal_emit(vh->slider_layout,
						       portrait ? "elm,state,slider,default" : "elm,state,slider,landscape", "elm");
		}
		ie_effect_grid_update_position_add(vh);
		ie_image_refit(vh->main_image);
		break;
	case IE_VIEW_TYPE_CROP:
		elm_object_signal_emit(vh->layout, "elm,state,toolbar,hide", "elm");
		if (vh->selectbox)
			ie_selectbox_rotate(vh->selectbox);
		break;
	default:
		break;
	}
}
