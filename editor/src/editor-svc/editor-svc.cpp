/* The editor record and the host interface: creation of the editor layout
 * with its naviframe and bars, loading the picture, and teardown. */
#include <libintl.h>

#include <gadget_window.h>

#include "editor-svc-private.h"
#include "ie-idler.h"
#include "ie-image.h"
#include "ie-save.h"

Viewhandle *IE_INIT(void)
{
	auto *vh = static_cast<Viewhandle *>(calloc(1, sizeof(Viewhandle)));
	if (!vh) {
		IE_LOG_E("Cannot alloc Viewhandle");
		return NULL;
	}
	vh->effect_index = -1;
	return vh;
}

Evas_Object *create_layout(Evas_Object *parent, const char *group)
{
	IE_CHECK_NULL(parent);

	Evas_Object *layout = elm_layout_add(parent);
	if (!layout) {
		IE_LOG_E("Cannot create layout");
		return NULL;
	}
	if (!elm_layout_file_set(layout, IE_EDJ_FILE, group)) {
		IE_LOG_E("Layout file set failed! %s in %s", group, IE_EDJ_FILE);
		evas_object_del(layout);
		return NULL;
	}
	evas_object_size_hint_weight_set(layout, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	evas_object_size_hint_align_set(layout, EVAS_HINT_FILL, EVAS_HINT_FILL);
	evas_object_show(layout);
	return layout;
}

int ie_window_rotation_get(void)
{
	Evas_Object *win = ug_get_window();
	return win ? elm_win_rotation_get(win) : 0;
}

static void _on_more_key(void *, Evas_Object *, void *)
{
}

static void _naviframe_back_cb(void *, Evas_Object *obj, void *)
{
	elm_naviframe_item_pop(obj);
}

/* The back key pops the item; the editor treats it as Cancel and keeps the
 * item, so its layout never changes under the host. */
static Eina_Bool _naviframe_pop_cb(void *data, Elm_Object_Item *)
{
	_on_menu_cancel(data, NULL, NULL);
	return EINA_FALSE;
}

static Eina_Bool create_navi_ly(Viewhandle *vh)
{
	vh->naviframe = elm_naviframe_add(vh->layout);
	if (!vh->naviframe) {
		IE_LOG_E("Cannot create layout");
		IE_LOG_E("navi_bar is NULL..!!");
		return EINA_FALSE;
	}
	evas_object_size_hint_weight_set(vh->naviframe, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	evas_object_size_hint_align_set(vh->naviframe, EVAS_HINT_FILL, EVAS_HINT_FILL);
	evas_object_show(vh->naviframe);
	elm_theme_extension_add(NULL, IE_EDJ_FILE);
	evas_object_name_set(vh->naviframe, "Naviframe");
	elm_object_part_content_set(vh->layout, "elm.swallow.navibar", vh->naviframe);
	return EINA_TRUE;
}

static Evas_Object *create_empty_ly(Viewhandle *vh)
{
	Evas_Object *empty = create_layout(vh->naviframe, "empty_layout");
	if (!empty) {
		IE_LOG_E("Cannot create toolbar");
		return NULL;
	}
	evas_object_show(empty);
	evas_object_name_set(empty, "Transparent Layout");
	return empty;
}

static void setup_naviframe(Viewhandle *vh)
{
	elm_naviframe_prev_btn_auto_pushed_set(vh->naviframe, EINA_FALSE);
	ea_object_event_callback_add(vh->naviframe, EA_CALLBACK_BACK, _naviframe_back_cb, vh);
	ea_object_event_callback_add(vh->naviframe, EA_CALLBACK_MORE, _on_more_key, vh);

	Elm_Object_Item *item = elm_naviframe_item_push(vh->naviframe, NULL, NULL, NULL, vh->scroller, "empty/custom");
	elm_naviframe_item_title_enabled_set(item, EINA_FALSE, EINA_FALSE);
	ea_theme_object_item_color_replace(item, "B0211", "transparent");
	elm_object_item_domain_part_text_translatable_set(item, NULL, IE_HOST_TEXT_DOMAIN, EINA_TRUE);
	elm_naviframe_item_pop_cb_set(item, _naviframe_pop_cb, vh);
	elm_object_focus_set(vh->naviframe, EINA_TRUE);
	vh->navi_item = item;
}

static void release_editor(Viewhandle *vh)
{
	if (vh->color_table)
		ea_theme_color_table_free(vh->color_table);
	if (vh->font_table)
		ea_theme_font_table_free(vh->font_table);
	evas_object_del(vh->layout);
	free(vh);
}

Viewhandle *IE_create(Evas_Object *parent)
{
	IE_CHECK_NULL(parent);

	bindtextdomain(IE_TEXT_DOMAIN, RES_DIR "locale");
	bind_textdomain_codeset(IE_TEXT_DOMAIN, "UTF-8");

	Viewhandle *vh = IE_INIT();
	if (!vh)
		return NULL;

	vh->layout = create_layout(parent, "iv-editor-view");
	if (!vh->layout) {
		IE_LOG_E("Cannot create IV-EDITOR view");
		free(vh);
		return NULL;
	}
	evas_object_name_set(vh->layout, "LyIVEDITView");

	ea_theme_object_changeable_ui_enabled_set(vh->layout, EINA_TRUE);
	ea_theme_object_style_set(vh->layout, ASSIST_STYLE_DARK);

	/* ie_changeableColorsSet */
	vh->color_table = ea_theme_color_table_new(RES_DIR "image-editor-color.xml");
	if (vh->color_table)
		ea_theme_object_colors_set(vh->layout, vh->color_table, ASSIST_STYLE_DARK);
	else
		IE_LOG_E("ea_theme_color_table_new failed");

	/* ie_changeableFontsSet */
	vh->font_table = ea_theme_font_table_new(RES_DIR "image-editor-font.xml");
	if (vh->font_table)
		ea_theme_object_fonts_set(vh->layout, vh->font_table);
	else
		IE_LOG_E("ea_theme_font_table_new failed");

	if (!create_navi_ly(vh)) {
		release_editor(vh);
		return NULL;
	}

	vh->scroller = elm_scroller_add(vh->layout);
	elm_scroller_policy_set(vh->scroller, ELM_SCROLLER_POLICY_OFF, ELM_SCROLLER_POLICY_OFF);
	evas_object_show(vh->scroller);

	vh->transparent_layout = create_empty_ly(vh);
	if (vh->transparent_layout) {
		setup_naviframe(vh);
		vh->edited = EINA_FALSE;
		create_funcbar(vh);
		vh->effect_applied = EINA_FALSE;
		create_gengrid_toolbar(vh);
	}

	_ie_log_manager_create(vh);
	_ie_log_manager_insert(vh, "EDIT");
	return vh;
}

static Eina_Bool _request_close_idler(void *data)
{
	auto *vh = static_cast<Viewhandle *>(data);
	evas_object_smart_callback_call(vh->layout, "delete,me", NULL);
	return ECORE_CALLBACK_CANCEL;
}

static void _on_layout_moved(void *, Evas *, Evas_Object *, void *)
{
}

/* A picture loaded in the background can still turn out unreadable: the
 * editor then closes as for any picture that cannot be loaded. */
static void _on_image_load_failed(void *data, Evas_Object *, void *)
{
	ie_idler_add(static_cast<Viewhandle *>(data), _request_close_idler);
}

void IE_setparam(Viewhandle *vh, const char *path, int width, int height, int rotation)
{
	if (!vh)
		return;

	if (rotation == 0 || rotation == 180) {
		vh->width = width;
		vh->height = height;
	} else {
		vh->width = height;
		vh->height = width;
	}

	vh->main_image = ie_image_add(vh->layout);
	if (!ie_image_file_load(vh->main_image, path, vh->width, vh->height)) {
		evas_object_del(vh->main_image);
		vh->main_image = NULL;
		ie_idler_add(vh, _request_close_idler);
		return;
	}

	evas_object_smart_callback_add(vh->main_image, IE_IMAGE_SIGNAL_LOAD_FAILED, _on_image_load_failed, vh);
	evas_object_size_hint_align_set(vh->main_image, 0.5, 0.5);
	evas_object_size_hint_weight_set(vh->scroller, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	evas_object_size_hint_align_set(vh->scroller, EVAS_HINT_FILL, EVAS_HINT_FILL);
	evas_object_show(vh->main_image);
	elm_object_content_set(vh->scroller, vh->main_image);

	_save_init(path);

	evas_object_event_callback_add(vh->layout, EVAS_CALLBACK_RESIZE, _on_layout_resized, vh);
	evas_object_event_callback_add(vh->layout, EVAS_CALLBACK_MOVE, _on_layout_moved, vh);

	ie_view_mgr_set_view(IE_VIEW_TYPE_MAIN, vh);

	if (ie_rotation_is_portrait(vh->win_rotation)) {
		elm_object_signal_emit(vh->layout, "toolbar,portrait", "elm");
		elm_object_signal_emit(vh->layout, "pre,effect,portrait", "elm");
	} else {
		elm_object_signal_emit(vh->layout, "toolbar,landscape", "elm");
		elm_object_signal_emit(vh->layout, "pre,effect,landscape", "elm");
	}
}

Evas_Object *IE_get_view_object(Viewhandle *vh)
{
	IE_CHECK_NULL_AS(vh, "Viewhandle");
	return vh->layout;
}

void IE_destroy(Viewhandle *vh)
{
	_ie_log_manager_destroy(vh);
	IE_CHECK_AS(vh, "Viewhandle");

	/* Nothing deferred may run on the freed record: pending idlers go, and
	 * an open view is closed while its objects still exist. A popup still up
	 * goes first: deleted only with the layout, it is left registered with
	 * the window's focus manager, and closed after the view it hands the
	 * focus back to a widget of that view already deleted. */
	ie_idlers_cancel(vh);
	_save_flow_release(vh);
	_popup_close(vh);
	int view = ie_view_mgr_get_current_view();
	if (view == IE_VIEW_TYPE_EFFECT || view == IE_VIEW_TYPE_CROP)
		ie_view_mgr_set_view(IE_VIEW_TYPE_MAIN, vh);

	if (vh->color_table) {
		ea_theme_color_table_free(vh->color_table);
		vh->color_table = NULL;
	}
	if (vh->font_table) {
		ea_theme_font_table_free(vh->font_table);
		vh->font_table = NULL;
	}
	if (vh->main_image) {
		evas_object_del(vh->main_image);
		vh->main_image = NULL;
	}
	if (vh->layout) {
		evas_object_del(vh->layout);
		vh->layout = NULL;
	}
	free(vh);
}

void IE_pause(Viewhandle *)
{
}

void IE_resume(Viewhandle *)
{
}
