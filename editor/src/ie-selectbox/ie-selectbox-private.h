/* The selection box's record, shared by the object (ie-selectbox.cpp) and
 * its touch input (ie-selectbox-input.cpp). Internal to ie-selectbox. */
#ifndef IE_SELECTBOX_PRIVATE_H
#define IE_SELECTBOX_PRIVATE_H

#include <Evas.h>

#include "ie-selectbox.h"

/* The part of the box held by the single touch. */
typedef enum {
	GRAB_NONE = 0,
	GRAB_INSIDE = 1,
	GRAB_TOP = 2,
	GRAB_LEFT = 3,
	GRAB_RIGHT = 4,
	GRAB_BOTTOM = 5,
	GRAB_TOP_LEFT = 6,
	GRAB_TOP_RIGHT = 7,
	GRAB_BOTTOM_LEFT = 8,
	GRAB_BOTTOM_RIGHT = 9
} Selectbox_Grab;

/* Indices of `handles`, `lines` and `shades`: also their creation order. */
enum {
	HANDLE_TOP_LEFT,
	HANDLE_BOTTOM_RIGHT,
	HANDLE_BOTTOM_LEFT,
	HANDLE_TOP_RIGHT,
	HANDLE_LEFT,
	HANDLE_RIGHT,
	HANDLE_BOTTOM,
	HANDLE_TOP,
	HANDLE_COUNT
};
enum { LINE_TOP, LINE_LEFT, LINE_BOTTOM, LINE_RIGHT, LINE_COUNT };
enum { SHADE_ABOVE, SHADE_RIGHT, SHADE_BELOW, SHADE_LEFT, SHADE_COUNT };

/* The rectangle and the canvas size the members are laid out for. */
typedef struct {
	Evas_Coord left, top, right, bottom;
	Evas_Coord canvas_w, canvas_h;
} Selectbox_Layout;

typedef struct {
	Evas_Object *obj;
	Eina_Bool visible;
	Evas_Coord x, y;
	Evas_Coord w, h;
	/* The crop rectangle. */
	Evas_Coord left, top, right, bottom;
	/* The picture's area when last recorded; the rotation remap maps from
	 * it. */
	Evas_Coord area_left, area_top, area_right, area_bottom;
	int grab;
	Evas_Object *image;
	Eina_Bool rotate_pending;
	Eina_Bool multi;
	Evas_Object *event_rect;
	Evas_Object *handles[HANDLE_COUNT];
	Evas_Object *lines[LINE_COUNT];
	Evas_Object *shades[SHADE_COUNT];
	/* Height : width; (0, 0) until a ratio is set, (0, 1) in the free mode. */
	int ratio_h, ratio_w;
	Eina_Bool fixed;
	/* What the members were last laid out for (none yet while `laid_out`
	 * is clear): a member whose place stays is not touched again. */
	Selectbox_Layout laid;
	Eina_Bool laid_out;
	/* The box's canvas, which an object never changes: looking it up on
	 * every layout costs a finger move a few per cent. */
	Evas *canvas;
} Selectbox_Smart_Data;

/* The record of a selection box, or NULL for any other object. */
Selectbox_Smart_Data *_selectbox_data_get(const Evas_Object *obj);

/* The record of an object known to be a selection box: the object of a
 * smart hook, or the data of a callback the box registered itself. Skips
 * the class check, which costs more than a finger move's own work. */
static inline Selectbox_Smart_Data *_selectbox_own_data(const Evas_Object *box)
{
	return static_cast<Selectbox_Smart_Data *>(evas_object_smart_data_get(box));
}

/* The screen's width and height in the window's current orientation. */
void _selectbox_screen_size_get(int *width, int *height);

/* Records the picture's current geometry as the area the rotation remap
 * maps from. */
void _selectbox_area_record(Selectbox_Smart_Data *sd);

/* Single touch, on the event rectangle; the box is the data. */
void _on_mouse_down(void *data, Evas *e, Evas_Object *obj, void *event_info);
void _on_mouse_up(void *data, Evas *e, Evas_Object *obj, void *event_info);
void _on_mouse_move(void *data, Evas *e, Evas_Object *obj, void *event_info);
/* Further touch points, on the picture; the box is the data. */
void _on_mouse_multi_down(void *data, Evas *e, Evas_Object *obj, void *event_info);
void _on_mouse_multi_up(void *data, Evas *e, Evas_Object *obj, void *event_info);
void _on_mouse_multi_move(void *data, Evas *e, Evas_Object *obj, void *event_info);

#endif
