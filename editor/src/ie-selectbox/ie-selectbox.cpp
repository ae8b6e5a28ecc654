/* The selection box smart object "ie-selectbox": the crop rectangle as four
 * lines, eight handles on its corners and edge middles, four translucent
 * bands darkening the canvas around it, and an invisible rectangle over the
 * whole object that takes the single touch (ie-selectbox-input.cpp). It
 * knows the picture's inner image object, so that it can centre itself on
 * it, follow pinches and map itself onto it after a window rotation. */
#include <Elementary.h>

#include <gadget_window.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "ie-config.h"
#include "ie-debug.h"
#include "ie-selectbox-private.h"

namespace {

constexpr const char *SELECTBOX_CLASS_NAME = "ie-selectbox";
constexpr const char *HANDLE_FILE = RES_DIR "images/image_viewer_crop_rectanglel.png";
constexpr int HANDLE_SIZE = 18;
constexpr int HANDLE_HALF = HANDLE_SIZE / 2;
constexpr int SHADE_ALPHA = 102;
/* Free mode: half size of the rectangle on a picture reaching the screen
 * edge. */
constexpr int FREE_HALF_SIZE = 200;
/* Fixed modes: the rectangle's height on a picture tall enough for it. */
constexpr double FIXED_REFERENCE_HEIGHT = 200.0;
constexpr int SMALL_PICTURE_HEIGHT = 199;

/* The window's size in both orientations, shared by every box and rewritten
 * by each ie_selectbox_add. */
struct Selectbox_Screen {
	int portrait_w, portrait_h;
	int landscape_w, landscape_h;
};
Selectbox_Screen g_selectbox_screen;

int window_rotation(void)
{
	Evas_Object *win = ug_get_window();
	return win ? elm_win_rotation_get(win) : 0;
}

bool is_portrait(int rotation)
{
	return rotation == 0 || rotation == 180;
}

/* Without a registered window the canvas stands in for the screen. */
void screen_record(Evas *canvas)
{
	Evas_Object *win = ug_get_window();
	int w = 0, h = 0;
	if (win)
		evas_object_geometry_get(win, NULL, NULL, &w, &h);
	else
		evas_output_size_get(canvas, &w, &h);
	if (is_portrait(win ? elm_win_rotation_get(win) : 0)) {
		g_selectbox_screen.portrait_w = g_selectbox_screen.landscape_h = w;
		g_selectbox_screen.portrait_h = g_selectbox_screen.landscape_w = h;
	} else {
		g_selectbox_screen.portrait_w = g_selectbox_screen.landscape_h = h;
		g_selectbox_screen.portrait_h = g_selectbox_screen.landscape_w = w;
	}
}

/* Where a new rectangle is centred: on the picture, or on the screen's
 * middle along an axis where the picture fills the screen. In landscape a
 * picture exactly as large as the screen counts as not filling it. */
void placement_centre(Evas_Coord ix, Evas_Coord iy, Evas_Coord iw, Evas_Coord ih, Evas_Coord *cx, Evas_Coord *cy)
{
	int sw, sh;
	_selectbox_screen_size_get(&sw, &sh);
	bool portrait = is_portrait(window_rotation());
	bool fills_w = portrait ? iw >= sw : iw > sw;
	bool fills_h = portrait ? ih >= sh : ih > sh;
	*cx = fills_w ? sw / 2 : ix + iw / 2;
	*cy = fills_h ? sh / 2 : iy + ih / 2;
}

/* The smallest box a rotation may leave, by ratio mode. */
void rotation_minimum_apply(const Selectbox_Smart_Data *sd, int *bw, int *bh)
{
	if (!sd->fixed) {
		*bw = std::max(*bw, 40);
		*bh = std::max(*bh, 40);
	} else if (sd->ratio_h == 1 && sd->ratio_w == 1) {
		if (*bw <= 39 || *bh <= 39)
			*bw = *bh = 40;
	} else if (sd->ratio_h == 3 && sd->ratio_w == 4) {
		if (*bw <= 133 || *bh <= 99) {
			*bw = 134;
			*bh = 100;
		}
	} else if (*bw <= 177 || *bh <= 99) {
		*bw = 178;
		*bh = 100;
	}
}

/* Maps the rectangle from the recorded area onto the picture's current
 * geometry, keeping it on the picture and on the screen. */
void rotation_remap(Selectbox_Smart_Data *sd)
{
	sd->rotate_pending = EINA_FALSE;
	Evas_Coord nx, ny, nw, nh;
	evas_object_geometry_get(sd->image, &nx, &ny, &nw, &nh);
	const int64_t aw = sd->area_right - sd->area_left;
	const int64_t ah = sd->area_bottom - sd->area_top;
	const Evas_Coord width = sd->right - sd->left;
	const Evas_Coord height = sd->bottom - sd->top;

	Evas_Coord left, top;
	int bw, bh;
	if (aw <= 0 || ah <= 0) {
		/* An empty recorded area gives no scale: the rectangle keeps its
		 * size, no larger than the picture, centred as a new one would be. */
		bw = width;
		bh = height;
		rotation_minimum_apply(sd, &bw, &bh);
		bw = std::min(bw, nw);
		bh = std::min(bh, nh);
		Evas_Coord cx, cy;
		placement_centre(nx, ny, nw, nh, &cx, &cy);
		left = cx - bw / 2;
		top = cy - bh / 2;
	} else {
		/* A rectangle reaching past the area's left (top) edge starts at
		 * the picture's edge. */
		const int64_t ox = std::max(sd->left - sd->area_left, 0);
		const int64_t oy = std::max(sd->top - sd->area_top, 0);
		bw = static_cast<int>(static_cast<double>(width) * nw / aw);
		bh = static_cast<int>(static_cast<double>(height) * nh / ah);
		rotation_minimum_apply(sd, &bw, &bh);
		left = nx + static_cast<Evas_Coord>(nw * ox / aw);
		top = ny + static_cast<Evas_Coord>(nh * oy / ah);
	}
	if (left + bw > nx + nw)
		left = nx + nw - bw;
	if (top + bh > ny + nh)
		top = ny + nh - bh;

	int sw, sh;
	_selectbox_screen_size_get(&sw, &sh);
	if (sw < left)
		left = sw / 2;
	if (sh < top)
		top = sh / 2;
	sd->left = left;
	sd->top = top;
	sd->right = (left + bw >= sw) ? sw : left + bw;
	sd->bottom = (top + bh >= sh) ? sh : top + bh;
	sd->area_left = nx;
	sd->area_top = ny;
	sd->area_right = nx + nw;
	sd->area_bottom = ny + nh;
}

/* Where every member goes for one layout, by index (LINE_*, HANDLE_*,
 * SHADE_*). */
struct Member_Places {
	Evas_Coord lines[LINE_COUNT][4];
	Evas_Coord handles[HANDLE_COUNT][2];
	struct {
		Evas_Coord x, y, w, h;
	} shades[SHADE_COUNT];
};

Member_Places member_places(const Selectbox_Layout &lay)
{
	const Evas_Coord l = lay.left, t = lay.top, r = lay.right, b = lay.bottom;
	const Evas_Coord w = r - l, h = b - t;
	const Evas_Coord hw = w / 2, hh = h / 2;
	Member_Places p = {
		{{l, t, r, t}, {l, t, l, b}, {l, b, r, b}, {r, t, r, b}},
		{},
		{{0, 0, lay.canvas_w, t}, {r, t, lay.canvas_w - r, h}, {0, b, lay.canvas_w, lay.canvas_h - b}, {0, t, l, h}},
	};
	const Evas_Coord points[HANDLE_COUNT][2] = {
		{l, t}, {r, b}, {l, b}, {r, t}, {l, t + hh}, {r, t + hh}, {l + hw, b}, {l + hw, t},
	};
	for (int i = 0; i < HANDLE_COUNT; i++) {
		p.handles[i][0] = points[i][0] - HANDLE_HALF;
		p.handles[i][1] = points[i][1] - HANDLE_HALF;
	}
	return p;
}

/* A finger moving one corner or edge moves only some of the members, and
 * each Evas geometry call costs over a thousand instructions: the members
 * that stay where they are are left alone. */
void layout_members(Selectbox_Smart_Data *sd)
{
	/* The bands reach the canvas edges, whatever the box's own size. */
	Selectbox_Layout lay = {sd->left, sd->top, sd->right, sd->bottom, 0, 0};
	evas_output_size_get(sd->canvas, &lay.canvas_w, &lay.canvas_h);
	const bool all = !sd->laid_out;
	const Member_Places to = member_places(lay);
	const Member_Places from = all ? to : member_places(sd->laid);
	sd->laid = lay;
	sd->laid_out = EINA_TRUE;

	for (int i = 0; i < LINE_COUNT; i++) {
		const Evas_Coord *e = to.lines[i];
		if (all || memcmp(e, from.lines[i], sizeof(to.lines[i])) != 0)
			evas_object_line_xy_set(sd->lines[i], e[0], e[1], e[2], e[3]);
	}
	for (int i = 0; i < HANDLE_COUNT; i++) {
		const Evas_Coord *p = to.handles[i];
		if (all || p[0] != from.handles[i][0] || p[1] != from.handles[i][1])
			evas_object_move(sd->handles[i], p[0], p[1]);
	}
	for (int i = 0; i < SHADE_COUNT; i++) {
		const auto &band = to.shades[i], &was = from.shades[i];
		if (all || band.w != was.w || band.h != was.h)
			evas_object_resize(sd->shades[i], band.w, band.h);
		if (all || band.x != was.x || band.y != was.y)
			evas_object_move(sd->shades[i], band.x, band.y);
	}
}

void edge_handles_visible_set(Selectbox_Smart_Data *sd, bool visible)
{
	for (int i = HANDLE_LEFT; i <= HANDLE_TOP; i++) {
		if (visible)
			evas_object_show(sd->handles[i]);
		else
			evas_object_hide(sd->handles[i]);
	}
}

void picture_callbacks_set(Selectbox_Smart_Data *sd, Evas_Object *image, bool add);

void _on_image_del(void *data, Evas *, Evas_Object *image, void *)
{
	auto *sd = static_cast<Selectbox_Smart_Data *>(data);
	if (sd->image == image) {
		picture_callbacks_set(sd, image, false);
		sd->image = NULL;
	}
}

/* The multi-touch callbacks follow the picture; a picture deleted before the
 * box is simply forgotten. */
void picture_callbacks_set(Selectbox_Smart_Data *sd, Evas_Object *image, bool add)
{
	const struct {
		Evas_Callback_Type type;
		Evas_Object_Event_Cb func;
	} callbacks[] = {
		{EVAS_CALLBACK_MULTI_DOWN, _on_mouse_multi_down},
		{EVAS_CALLBACK_MULTI_UP, _on_mouse_multi_up},
		{EVAS_CALLBACK_MULTI_MOVE, _on_mouse_multi_move},
	};
	for (const auto &c : callbacks) {
		if (add)
			evas_object_event_callback_add(image, c.type, c.func, sd->obj);
		else
			evas_object_event_callback_del_full(image, c.type, c.func, sd->obj);
	}
	if (add)
		evas_object_event_callback_add(image, EVAS_CALLBACK_DEL, _on_image_del, sd);
	else
		evas_object_event_callback_del_full(image, EVAS_CALLBACK_DEL, _on_image_del, sd);
}

} // namespace

static void _selectbox_smart_add(Evas_Object *obj);
static void _selectbox_smart_del(Evas_Object *obj);
static void _selectbox_smart_move(Evas_Object *obj, Evas_Coord x, Evas_Coord y);
static void _selectbox_smart_resize(Evas_Object *obj, Evas_Coord w, Evas_Coord h);
static void _selectbox_smart_show(Evas_Object *obj);
static void _selectbox_smart_hide(Evas_Object *obj);
static void _selectbox_smart_color_set(Evas_Object *obj, int r, int g, int b, int a);
static void _selectbox_smart_calculate(Evas_Object *obj);

static Evas_Smart_Class _selectbox_class = {
	NULL, /* name: a stringshare, set on first use */
	EVAS_SMART_CLASS_VERSION,
	_selectbox_smart_add,
	_selectbox_smart_del,
	_selectbox_smart_move,
	_selectbox_smart_resize,
	_selectbox_smart_show,
	_selectbox_smart_hide,
	_selectbox_smart_color_set,
	NULL, /* clip_set */
	NULL, /* clip_unset */
	_selectbox_smart_calculate,
	NULL, /* member_add */
	NULL, /* member_del */
	NULL, /* parent */
	NULL, /* callbacks */
	NULL, /* interfaces */
	NULL  /* data */
};

/* Created on first use and kept for the life of the process. */
static Evas_Smart *_selectbox_smart;

Selectbox_Smart_Data *_selectbox_data_get(const Evas_Object *obj)
{
	if (!obj || !_selectbox_class.name || !evas_object_smart_type_check_ptr(obj, _selectbox_class.name))
		return NULL;
	return static_cast<Selectbox_Smart_Data *>(evas_object_smart_data_get(obj));
}

void _selectbox_screen_size_get(int *width, int *height)
{
	if (is_portrait(window_rotation())) {
		*width = g_selectbox_screen.portrait_w;
		*height = g_selectbox_screen.portrait_h;
	} else {
		*width = g_selectbox_screen.landscape_w;
		*height = g_selectbox_screen.landscape_h;
	}
}

void _selectbox_area_record(Selectbox_Smart_Data *sd)
{
	Evas_Coord ix, iy, iw, ih;
	evas_object_geometry_get(sd->image, &ix, &iy, &iw, &ih);
	sd->area_left = ix;
	sd->area_top = iy;
	sd->area_right = ix + iw;
	sd->area_bottom = iy + ih;
}

static void _selectbox_smart_add(Evas_Object *obj)
{
	auto *sd = static_cast<Selectbox_Smart_Data *>(calloc(1, sizeof(Selectbox_Smart_Data)));
	if (!sd) {
		IE_LOG_E("Cannot alloc Selectbox_Smart_Data");
		return;
	}
	evas_object_smart_data_set(obj, sd);
	sd->obj = obj;
	Evas *canvas = evas_object_evas_get(obj);
	sd->canvas = canvas;

	for (Evas_Object *&shade : sd->shades) {
		shade = evas_object_rectangle_add(canvas);
		evas_object_size_hint_align_set(shade, EVAS_HINT_FILL, EVAS_HINT_FILL);
		evas_object_color_set(shade, 0, 0, 0, SHADE_ALPHA);
		evas_object_repeat_events_set(shade, EINA_TRUE);
		evas_object_smart_member_add(shade, obj);
	}
	for (Evas_Object *&line : sd->lines) {
		line = evas_object_line_add(canvas);
		evas_object_smart_member_add(line, obj);
	}
	for (Evas_Object *&handle : sd->handles) {
		handle = evas_object_image_add(canvas);
		evas_object_image_file_set(handle, HANDLE_FILE, NULL);
		evas_object_image_fill_set(handle, 0, 0, HANDLE_SIZE, HANDLE_SIZE);
		evas_object_resize(handle, HANDLE_SIZE, HANDLE_SIZE);
		evas_object_size_hint_weight_set(handle, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
		evas_object_smart_member_add(handle, obj);
	}

	sd->event_rect = evas_object_rectangle_add(canvas);
	evas_object_color_set(sd->event_rect, 0, 0, 0, 0);
	evas_object_pass_events_set(sd->event_rect, EINA_FALSE);
	evas_object_show(sd->event_rect);
	evas_object_smart_member_add(sd->event_rect, obj);
	evas_object_event_callback_add(sd->event_rect, EVAS_CALLBACK_MOUSE_DOWN, _on_mouse_down, obj);
	evas_object_event_callback_add(sd->event_rect, EVAS_CALLBACK_MOUSE_UP, _on_mouse_up, obj);
	evas_object_event_callback_add(sd->event_rect, EVAS_CALLBACK_MOUSE_MOVE, _on_mouse_move, obj);
}

static void _selectbox_smart_del(Evas_Object *obj)
{
	Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	if (!sd)
		return;

	if (sd->image) {
		picture_callbacks_set(sd, sd->image, false);
		sd->image = NULL;
	}
	for (Evas_Object *&shade : sd->shades) {
		evas_object_del(shade);
		shade = NULL;
	}
	for (Evas_Object *&line : sd->lines) {
		evas_object_del(line);
		line = NULL;
	}
	for (Evas_Object *&handle : sd->handles) {
		evas_object_del(handle);
		handle = NULL;
	}
	evas_object_del(sd->event_rect);
	sd->event_rect = NULL;
	evas_object_smart_data_set(obj, NULL);
	free(sd);
}

static void _selectbox_smart_move(Evas_Object *obj, Evas_Coord x, Evas_Coord y)
{
	Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	if (!sd || (sd->x == x && sd->y == y))
		return;
	sd->x = x;
	sd->y = y;
	evas_object_move(sd->event_rect, x, y);
	evas_object_smart_changed(obj);
}

static void _selectbox_smart_resize(Evas_Object *obj, Evas_Coord w, Evas_Coord h)
{
	Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	if (!sd || (sd->w == w && sd->h == h))
		return;
	sd->w = w;
	sd->h = h;
	evas_object_resize(sd->event_rect, w, h);
	evas_object_smart_changed(obj);
}

/* Shades, lines, handles, event rectangle: the members in creation order. */
static void members_visible_set(Selectbox_Smart_Data *sd, bool visible)
{
	Evas_Object *members[SHADE_COUNT + LINE_COUNT + HANDLE_COUNT + 1];
	int n = 0;
	for (Evas_Object *o : sd->shades)
		members[n++] = o;
	for (Evas_Object *o : sd->lines)
		members[n++] = o;
	for (Evas_Object *o : sd->handles)
		members[n++] = o;
	members[n++] = sd->event_rect;
	for (Evas_Object *o : members) {
		if (visible)
			evas_object_show(o);
		else
			evas_object_hide(o);
	}
}

/* Showing brings back all eight handles, also those a fixed ratio hid. */
static void _selectbox_smart_show(Evas_Object *obj)
{
	Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	if (!sd || sd->visible)
		return;
	sd->visible = EINA_TRUE;
	members_visible_set(sd, true);
}

static void _selectbox_smart_hide(Evas_Object *obj)
{
	Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	if (!sd || !sd->visible)
		return;
	sd->visible = EINA_FALSE;
	members_visible_set(sd, false);
}

/* The colour is the box's outline: the darkening bands keep theirs. */
static void _selectbox_smart_color_set(Evas_Object *obj, int r, int g, int b, int a)
{
	Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	if (!sd)
		return;
	for (Evas_Object *line : sd->lines)
		evas_object_color_set(line, r, g, b, a);
	for (Evas_Object *handle : sd->handles)
		evas_object_color_set(handle, r, g, b, a);
}

static void _selectbox_smart_calculate(Evas_Object *obj)
{
	Selectbox_Smart_Data *sd = _selectbox_own_data(obj);
	if (!sd || !sd->image)
		return;
	if (sd->rotate_pending)
		rotation_remap(sd);
	layout_members(sd);
}

Evas_Object *ie_selectbox_add(Evas_Object *parent)
{
	IE_CHECK_NULL(parent);

	if (!_selectbox_smart) {
		_selectbox_class.name = eina_stringshare_add(SELECTBOX_CLASS_NAME);
		_selectbox_smart = evas_smart_class_new(&_selectbox_class);
	}
	Evas *canvas = evas_object_evas_get(parent);
	screen_record(canvas);
	Evas_Object *obj = evas_object_smart_add(canvas, _selectbox_smart);
	if (!_selectbox_data_get(obj)) {
		IE_LOG_E("Cannot create the selection box");
		if (obj)
			evas_object_del(obj);
		return NULL;
	}
	evas_object_name_set(obj, "SelectBox");
	return obj;
}

void ie_selectbox_set_image(Evas_Object *obj, Evas_Object *image)
{
	Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	if (!sd || !image)
		return;
	/* Only the attached picture may pause or move the box. */
	if (sd->image != image) {
		if (sd->image)
			picture_callbacks_set(sd, sd->image, false);
		sd->image = image;
		picture_callbacks_set(sd, image, true);
	}
	_selectbox_area_record(sd);
}

void ie_selectbox_set_ratio(Evas_Object *obj, int ratio_h, int ratio_w)
{
	IE_CHECK(obj);
	Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	if (!sd || (ratio_h == sd->ratio_h && ratio_w == sd->ratio_w) || !sd->image)
		return;

	const bool free_mode = ratio_h == 0 && ratio_w != 0;
	const bool keep_current = ratio_h == 0 && ratio_w == 0;
	if (keep_current) {
		ratio_h = sd->bottom - sd->top;
		ratio_w = sd->right - sd->left;
	}
	/* A zero or negative term has no shape: it would divide by zero or turn
	 * the rectangle inside out. */
	if (!free_mode && (ratio_h <= 0 || ratio_w <= 0)) {
		IE_LOG_E("Invalid ratio %d:%d", ratio_h, ratio_w);
		return;
	}

	Evas_Coord ix, iy, iw, ih;
	evas_object_geometry_get(sd->image, &ix, &iy, &iw, &ih);
	Evas_Coord cx, cy;
	placement_centre(ix, iy, iw, ih, &cx, &cy);

	if (free_mode) {
		sd->ratio_h = 0;
		sd->ratio_w = 1;
		const Evas_Coord half_w = ix <= 0 ? FREE_HALF_SIZE : iw / 4;
		const Evas_Coord half_h = iy <= 0 ? FREE_HALF_SIZE : ih / 4;
		sd->left = cx - half_w;
		sd->right = cx + half_w;
		sd->top = cy - half_h;
		sd->bottom = cy + half_h;
		sd->fixed = EINA_FALSE;
		evas_object_smart_changed(obj);
		/* Hidden, the box shows them all again when it is shown. */
		if (sd->visible)
			for (Evas_Object *handle : sd->handles)
				evas_object_show(handle);
		return;
	}

	sd->fixed = EINA_TRUE;
	sd->ratio_h = ratio_h;
	sd->ratio_w = ratio_w;
	edge_handles_visible_set(sd, false);

	const double r = static_cast<double>(ratio_h) / ratio_w;
	const int t = static_cast<int>(FIXED_REFERENCE_HEIGHT / r);
	int hw, hh;
	if (ih > SMALL_PICTURE_HEIGHT) {
		hw = t > iw ? iw / 2 : t / 2;
		hh = static_cast<int>(hw * r);
	} else if (t > iw && ih > iw * r) {
		hw = iw / 2;
		hh = static_cast<int>(hw * r);
	} else {
		hh = ih / 2;
		hw = static_cast<int>(hh / r);
	}
	sd->left = cx - hw;
	sd->top = cy - hh;
	sd->right = cx + hw;
	sd->bottom = cy + hh;
	evas_object_smart_changed(obj);
}

void ie_selectbox_get_region(Evas_Object *obj, Evas_Coord *x, Evas_Coord *y, Evas_Coord *w, Evas_Coord *h)
{
	const Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	const Evas_Coord region[4] = {
		sd ? sd->left : 0,
		sd ? sd->top : 0,
		sd ? sd->right - sd->left : 0,
		sd ? sd->bottom - sd->top : 0,
	};
	Evas_Coord *out[4] = {x, y, w, h};
	for (int i = 0; i < 4; i++)
		if (out[i])
			*out[i] = region[i];
}

void ie_selectbox_rotate(Evas_Object *obj)
{
	IE_CHECK(obj);
	Selectbox_Smart_Data *sd = _selectbox_data_get(obj);
	IE_CHECK(sd);
	sd->rotate_pending = EINA_TRUE;
	evas_object_smart_changed(obj);
}
