/* The editor record and the functions the editor's modules call in each
 * other. Everything here is internal to the library. */
#ifndef EDITOR_SVC_PRIVATE_H
#define EDITOR_SVC_PRIVATE_H

#include <Elementary.h>
#include <assist_theme.h>

#include "IEL_Types.h"
#include "editor-svc.h"
#include "ie-config.h"
#include "ie-debug.h"

#define IE_EDJ_FILE RES_DIR "edje/image-editor.edj"
#define IE_TEXT_DOMAIN "image-editor"
#define IE_HOST_TEXT_DOMAIN "marlune"

/* One editor: the host holds it as an opaque handle. Allocated zero-filled
 * by IE_INIT, freed by IE_destroy. Every module of the editor reads and
 * writes this one layout. */
struct _Viewhandle {
	Evas_Object *layout;
	Evas_Object *transparent_layout;
	Evas_Object *funcbar;
	Evas_Object *cancel_btn;
	Evas_Object *done_btn;
	Evas_Object *toolbar;
	Eina_List *effect_items;
	Evas_Object *naviframe;
	Evas_Object *main_image;
	Evas_Object *scroller;
	Elm_Object_Item *navi_item;
	int32_t width;
	int32_t height;
	int32_t thumb_width;
	int32_t thumb_height;
	int32_t image_width;
	int32_t image_height;
	unsigned char *thumb_buf;
	unsigned char *orig_buf;
	unsigned char *effect_buf;
	Elm_Gengrid_Item_Class *effect_itc;
	Evas_Object *effect_layout;
	Evas_Object *effect_grid;
	Elm_Gengrid_Item_Class *toolbar_itc;
	Evas_Object *selectbox;
	Evas_Object *crop_layout;
	Eina_Bool effect_applied;
	Eina_Bool slider_hidden;
	Eina_Bool rotated;
	Eina_Bool edited;
	Evas_Object *popup;
	Evas_Object *slider_layout;
	int32_t touch_x;
	int32_t touch_last_x;
	int32_t touch_y;
	int32_t effect_index;
	int32_t slider_touching;
	int32_t slider_value;
	int32_t slider_start_value;
	Assist_Colour_Table *color_table;
	int32_t win_rotation;
	Assist_Font_Table *font_table;
	void *log_handle;
	/* Crop view: the pending creation of its selection box, and whether a
	 * crop was ever applied to the picture. */
	Ecore_Idler *crop_box_idler;
	Eina_Bool cropped;

	/* Effect view: its own idlers, and what ties the picture to the slider. */
	Ecore_Idler *effect_update_idler;
	Ecore_Idler *effect_grid_idler;
	float effect_last_alpha;
	int32_t effect_buf_row;
	int32_t slider_drag_value;

	/* Save (ie-menu.cpp): the registration of the saved file still running
	 * after Done, and the processing popup shown when it takes a while. */
	struct _Ie_Save_Registration *save_registration;
	Ecore_Timer *save_popup_timer;
	Evas_Object *save_popup;
};

/* editor-svc.cpp */
Viewhandle *IE_INIT(void);
Evas_Object *create_layout(Evas_Object *parent, const char *group);

/* Window rotation in degrees of the window the editor lives in; 0 when the
 * host registered none. */
int ie_window_rotation_get(void);
/* 0 and 180 degrees are portrait, any other rotation landscape. */
static inline Eina_Bool ie_rotation_is_portrait(int rotation)
{
	return rotation == 0 || rotation == 180;
}

/* ie-bars.cpp */
void create_funcbar(Viewhandle *vh);
void create_gengrid_toolbar(Viewhandle *vh);
void _on_layout_resized(void *data, Evas *e, Evas_Object *obj, void *event_info);

/* ie-processing-popup.cpp: shown and returned, text_id translated in the
 * editor's domain; NULL when the popup cannot be made. */
Evas_Object *ie_processing_popup_add(Evas_Object *parent, const char *text_id);

/* ie-menu.cpp */
void _on_menu_cancel(void *data, Evas_Object *obj, void *event_info);
void _on_menu_done(void *data, Evas_Object *obj, void *event_info);
void _popup_close(Viewhandle *vh);
/* Done's crop: the picture replaced by its part under the selection box. */
void __apply_crop(Viewhandle *vh);
/* Forgets a save still registering, for IE_destroy: nothing of it runs on
 * the freed record. */
void _save_flow_release(Viewhandle *vh);

/* ie-effect-view.cpp, ie-effect-thumbnail.cpp: the data of one effect-grid
 * item. */
typedef struct {
	Viewhandle *viewhandle;
	int32_t index;
} Ie_Data_Item;

/* effect_last_alpha when nothing was blended since the last effect: the
 * picture shows effect_buf as it is. */
#define IE_EFFECT_NO_ALPHA (-1.0f)

void SetThumbnailBuffer(Viewhandle *vh);
Evas_Object *_effect_content_get(void *data, Evas_Object *obj, const char *part);
char *_effect_text_get(void *data, Evas_Object *obj, const char *part);
/* The full-size effect of `row` on the picture; false when it failed, the
 * picture then left as it was found. */
Eina_Bool generateEffect(Viewhandle *vh, int row);
void generateEffectAlpha(Viewhandle *vh, float alpha);
/* Schedules the scrolling of the effect grid to the picked item. */
void ie_effect_grid_update_position_add(Viewhandle *vh);
/* Removes the intensity drag's callbacks from the editor layout. */
void ie_effect_touch_callbacks_del(Viewhandle *vh);
/* A zero-filled pixel buffer of `bytes`, or NULL. */
unsigned char *ie_effect_buffer_new(size_t bytes);
/* Runs catalogue row `row`'s effect from `source` into the zero-filled
 * `output` of the same size; false when the effect failed. */
Eina_Bool ie_effect_run(IEL_Image *source, IEL_Image *output, int row);

/* ie-log-manager.cpp */
void *log_manager_create(void);
void _ie_log_manager_create(Viewhandle *vh);
void _ie_log_manager_insert(Viewhandle *vh, const char *feature);
void _ie_log_manager_destroy(Viewhandle *vh);

#endif
