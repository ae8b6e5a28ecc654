/* The main image smart object "ie-mainimg": the inner Evas image holding the
 * picture, fitted to the object's area, zoomed by pinch and double tap
 * between the fit scale and four times it, and panned by drags. All input
 * comes through an Elementary gesture layer attached to the object. */
#include <Elementary.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>

#include "ie-debug.h"
#include "ie-image-private.h"

namespace {

constexpr const char *MAINIMG_CLASS_NAME = "ie-mainimg";
constexpr double MAX_ZOOM_OF_FIT = 4.0;

struct Fit_Rect {
	Evas_Coord x, y, w, h;
	double scale;
};

} // namespace

static void _mainimg_smart_add(Evas_Object *obj);
static void _mainimg_smart_del(Evas_Object *obj);
static void _mainimg_smart_move(Evas_Object *obj, Evas_Coord x, Evas_Coord y);
static void _mainimg_smart_resize(Evas_Object *obj, Evas_Coord w, Evas_Coord h);
static void _mainimg_smart_show(Evas_Object *obj);
static void _mainimg_smart_hide(Evas_Object *obj);
static void _mainimg_smart_clip_set(Evas_Object *obj, Evas_Object *clip);
static void _mainimg_smart_clip_unset(Evas_Object *obj);
static void _mainimg_smart_calculate(Evas_Object *obj);

static Evas_Smart_Class _mainimg_class = {
	NULL, /* name: a stringshare, set on first use */
	EVAS_SMART_CLASS_VERSION,
	_mainimg_smart_add,
	_mainimg_smart_del,
	_mainimg_smart_move,
	_mainimg_smart_resize,
	_mainimg_smart_show,
	_mainimg_smart_hide,
	NULL, /* color_set */
	_mainimg_smart_clip_set,
	_mainimg_smart_clip_unset,
	_mainimg_smart_calculate,
	NULL, /* member_add */
	NULL, /* member_del */
	NULL, /* parent */
	NULL, /* callbacks */
	NULL, /* interfaces */
	NULL  /* data */
};

/* Created on first use and kept for the life of the process. */
static Evas_Smart *_mainimg_smart;

Mainimg_Smart_Data *_mainimg_data_get(const Evas_Object *obj)
{
	if (!obj || !_mainimg_class.name || !evas_object_smart_type_check_ptr(obj, _mainimg_class.name))
		return NULL;
	return static_cast<Mainimg_Smart_Data *>(evas_object_smart_data_get(obj));
}

/* The fit rectangle needs a picture and an area; without them there is
 * nothing to divide by. */
static bool _fit_rect_get(const Mainimg_Smart_Data *sd, Fit_Rect *fit)
{
	if (sd->img_w <= 0 || sd->img_h <= 0 || sd->w <= 0 || sd->h <= 0)
		return false;

	int64_t fh = (int64_t)sd->img_h * sd->w / sd->img_w;
	int64_t fw;
	if (sd->h >= fh) {
		fw = sd->w;
		fit->x = sd->x;
		fit->y = sd->y + (Evas_Coord)((sd->h - fh) / 2);
	} else {
		fw = (int64_t)sd->img_w * sd->h / sd->img_h;
		fh = sd->h;
		fit->x = sd->x + (Evas_Coord)((sd->w - fw) / 2);
		fit->y = sd->y;
	}
	fit->w = (Evas_Coord)fw;
	fit->h = (Evas_Coord)fh;
	fit->scale = std::max((double)fw / sd->img_w, (double)fh / sd->img_h);
	return true;
}

/* Where a picture `size` long goes on an axis of the area so that the
 * canvas coordinate `c` stays over the same picture pixel, without
 * uncovering the area's edges. */
static Evas_Coord _zoom_axis_position(Evas_Coord area_pos, Evas_Coord area_size, Evas_Coord size,
				      Evas_Coord c, Evas_Coord cur_pos, Evas_Coord cur_size)
{
	if (size <= area_size)
		return area_pos + (area_size - size) / 2;

	int64_t product = (int64_t)size * (c - cur_pos);
	Evas_Coord pos = c - (Evas_Coord)((double)product / cur_size);
	if (pos >= area_pos)
		pos = area_pos;
	if (pos + size < area_pos + area_size)
		pos = area_pos + area_size - size;
	return pos;
}

/* Shows the picture at scale `s`, keeping (cx, cy) over the same pixel. */
static void _zoom_at(Mainimg_Smart_Data *sd, Evas_Coord cx, Evas_Coord cy, double s)
{
	Evas_Coord px, py, pw, ph;
	evas_object_geometry_get(sd->image, &px, &py, &pw, &ph);
	if (pw <= 0 || ph <= 0 || sd->img_w <= 0 || sd->img_h <= 0 || s <= 0.0)
		return;

	Evas_Coord nw = (Evas_Coord)(sd->img_w * s);
	Evas_Coord nh = (Evas_Coord)(sd->img_h * s);
	Evas_Coord nx = _zoom_axis_position(sd->x, sd->w, nw, cx, px, pw);
	Evas_Coord ny = _zoom_axis_position(sd->y, sd->h, nh, cy, py, ph);

	evas_object_image_fill_set(sd->image, 0, 0, nw, nh);
	evas_object_resize(sd->image, nw, nh);
	evas_object_move(sd->image, nx, ny);
}

static Evas_Event_Flags _gesture_noop_cb(void *data, void *event_info)
{
	(void)data;
	(void)event_info;
	return EVAS_EVENT_FLAG_NONE;
}

static Evas_Event_Flags _zoom_start_cb(void *data, void *event_info)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(static_cast<Evas_Object *>(data));
	auto *info = static_cast<Elm_Gesture_Zoom_Info *>(event_info);
	if (!sd || !info)
		return EVAS_EVENT_FLAG_NONE;

	sd->last_x = info->x;
	sd->last_y = info->y;
	return EVAS_EVENT_FLAG_NONE;
}

static Evas_Event_Flags _zoom_move_cb(void *data, void *event_info)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(static_cast<Evas_Object *>(data));
	auto *info = static_cast<Elm_Gesture_Zoom_Info *>(event_info);
	Fit_Rect fit;
	if (!sd || !info || !sd->loaded || !_fit_rect_get(sd, &fit))
		return EVAS_EVENT_FLAG_NONE;

	sd->last_x = info->x;
	sd->last_y = info->y;
	/* `scale` is still the one from before the pinch: zoom is relative to it. */
	double s = sd->scale * info->zoom;
	if (s < fit.scale)
		s = fit.scale;
	else if (s > MAX_ZOOM_OF_FIT * fit.scale)
		s = MAX_ZOOM_OF_FIT * fit.scale;
	_zoom_at(sd, info->x, info->y, s);
	return EVAS_EVENT_FLAG_NONE;
}

static Evas_Event_Flags _zoom_end_cb(void *data, void *event_info)
{
	(void)event_info;
	Mainimg_Smart_Data *sd = _mainimg_data_get(static_cast<Evas_Object *>(data));
	Fit_Rect fit;
	if (!sd || !sd->loaded || !_fit_rect_get(sd, &fit))
		return EVAS_EVENT_FLAG_NONE;

	Evas_Coord pw, ph;
	evas_object_geometry_get(sd->image, NULL, NULL, &pw, &ph);
	double shown = std::max((double)pw / sd->img_w, (double)ph / sd->img_h);
	if (shown > fit.scale) {
		sd->scale = shown;
		sd->fitted = EINA_FALSE;
	} else {
		sd->scale = fit.scale;
		sd->fitted = EINA_TRUE;
	}
	return EVAS_EVENT_FLAG_NONE;
}

static Evas_Event_Flags _double_tap_end_cb(void *data, void *event_info)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(static_cast<Evas_Object *>(data));
	auto *info = static_cast<Elm_Gesture_Taps_Info *>(event_info);
	Fit_Rect fit;
	if (!sd || !info || !sd->loaded || !_fit_rect_get(sd, &fit))
		return EVAS_EVENT_FLAG_NONE;

	if (sd->scale > fit.scale) {
		sd->fitted = EINA_TRUE;
		evas_object_smart_changed(sd->obj);
	} else {
		double s = MAX_ZOOM_OF_FIT * fit.scale;
		_zoom_at(sd, info->x, info->y, s);
		sd->scale = s;
		sd->fitted = EINA_FALSE;
	}
	return EVAS_EVENT_FLAG_NONE;
}

/* In the crop view one-finger drags belong to the selection box. */
static bool _pan_ignored(const Mainimg_Smart_Data *sd, const Elm_Gesture_Momentum_Info *info)
{
	return sd->mode == IE_IMAGE_MODE_CROP && info->n == 1;
}

static Evas_Event_Flags _momentum_start_cb(void *data, void *event_info)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(static_cast<Evas_Object *>(data));
	auto *info = static_cast<Elm_Gesture_Momentum_Info *>(event_info);
	if (!sd || !info || _pan_ignored(sd, info))
		return EVAS_EVENT_FLAG_NONE;

	sd->last_x = info->x2;
	sd->last_y = info->y2;
	return EVAS_EVENT_FLAG_NONE;
}

/* New position of the picture on one axis after a drag by `d`: it never
 * uncovers the area's edges, and does not move when it is not larger than
 * the area. */
static Evas_Coord _pan_axis_position(Evas_Coord area_pos, Evas_Coord area_size, Evas_Coord pos,
				     Evas_Coord size, Evas_Coord d)
{
	if (size - area_size <= 0)
		return pos;
	if (d < 0)
		return (pos + size + d < area_pos + area_size) ? area_pos + area_size - size : pos + d;
	if (d > 0)
		return std::min(pos + d, area_pos);
	return pos;
}

static Evas_Event_Flags _momentum_move_cb(void *data, void *event_info)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(static_cast<Evas_Object *>(data));
	auto *info = static_cast<Elm_Gesture_Momentum_Info *>(event_info);
	if (!sd || !info || !sd->loaded || _pan_ignored(sd, info))
		return EVAS_EVENT_FLAG_NONE;

	Evas_Coord dx = info->x2 - sd->last_x;
	Evas_Coord dy = info->y2 - sd->last_y;
	if (dx == 0 && dy == 0)
		return EVAS_EVENT_FLAG_NONE;

	Evas_Coord px, py, pw, ph;
	evas_object_geometry_get(sd->image, &px, &py, &pw, &ph);
	if (pw <= 0 || ph <= 0)
		return EVAS_EVENT_FLAG_NONE;

	Evas_Coord nx = _pan_axis_position(sd->x, sd->w, px, pw, dx);
	Evas_Coord ny = _pan_axis_position(sd->y, sd->h, py, ph, dy);
	evas_object_move(sd->image, nx, ny);
	sd->last_x = info->x2;
	sd->last_y = info->y2;
	return EVAS_EVENT_FLAG_NONE;
}

/* The gesture layer lives on the parent: if the parent goes first, forget it. */
static void _gesture_deleted_cb(void *data, Evas *e, Evas_Object *gesture, void *event_info)
{
	(void)e;
	(void)event_info;
	auto *sd = static_cast<Mainimg_Smart_Data *>(data);
	if (sd->gesture == gesture)
		sd->gesture = NULL;
}

static void _create_event_obj(Mainimg_Smart_Data *sd)
{
	Evas_Object *gesture = elm_gesture_layer_add(sd->parent);
	if (!gesture) {
		IE_LOG_E("error to attach");
		return;
	}
	sd->gesture = gesture;
	evas_object_event_callback_add(gesture, EVAS_CALLBACK_DEL, _gesture_deleted_cb, sd);
	elm_gesture_layer_hold_events_set(gesture, EINA_FALSE);

	struct Gesture_Row {
		Elm_Gesture_Type type;
		Elm_Gesture_Event_Cb start, move, end, abort;
	};
	const Gesture_Row rows[] = {
		{ ELM_GESTURE_ZOOM, _zoom_start_cb, _zoom_move_cb, _zoom_end_cb, _gesture_noop_cb },
		{ ELM_GESTURE_MOMENTUM, _momentum_start_cb, _momentum_move_cb, _gesture_noop_cb, _gesture_noop_cb },
		{ ELM_GESTURE_N_FLICKS, _gesture_noop_cb, NULL, _gesture_noop_cb, _gesture_noop_cb },
		{ ELM_GESTURE_N_DOUBLE_TAPS, _gesture_noop_cb, NULL, _double_tap_end_cb, _gesture_noop_cb },
		{ ELM_GESTURE_N_TAPS, _gesture_noop_cb, NULL, _gesture_noop_cb, _gesture_noop_cb },
		{ ELM_GESTURE_N_LONG_TAPS, _gesture_noop_cb, _gesture_noop_cb, _gesture_noop_cb, _gesture_noop_cb },
	};
	for (const Gesture_Row &row : rows) {
		elm_gesture_layer_cb_set(gesture, row.type, ELM_GESTURE_STATE_START, row.start, sd->obj);
		if (row.move)
			elm_gesture_layer_cb_set(gesture, row.type, ELM_GESTURE_STATE_MOVE, row.move, sd->obj);
		elm_gesture_layer_cb_set(gesture, row.type, ELM_GESTURE_STATE_END, row.end, sd->obj);
		elm_gesture_layer_cb_set(gesture, row.type, ELM_GESTURE_STATE_ABORT, row.abort, sd->obj);
	}

	if (!elm_gesture_layer_attach(gesture, sd->obj))
		IE_LOG_E("error to attach");
	evas_object_name_set(gesture, "Slider:Getsture");
}

/* Another view put a picture of another size in through Evas: the main
 * image's own buffer, if it had one, is not shown any more. */
static void _image_resized_cb(void *data, Evas *e, Evas_Object *image, void *event_info)
{
	(void)e;
	(void)image;
	(void)event_info;
	_own_pixels_release_unshown(static_cast<Mainimg_Smart_Data *>(data));
}

static void _mainimg_smart_add(Evas_Object *obj)
{
	auto *sd = static_cast<Mainimg_Smart_Data *>(calloc(1, sizeof(Mainimg_Smart_Data)));
	if (!sd) {
		IE_LOG_E("Cannot alloc Mainimg_Smart_Data");
		return;
	}
	evas_object_smart_data_set(obj, sd);
	sd->obj = obj;
	sd->fitted = EINA_TRUE;
	sd->scale = -1.0;
	sd->mode = IE_IMAGE_MODE_PASSIVE;

	sd->image = evas_object_image_add(evas_object_evas_get(obj));
	evas_object_image_smooth_scale_set(sd->image, EINA_TRUE);
	evas_object_name_set(sd->image, "mImage");
	evas_object_smart_member_add(sd->image, obj);
	evas_object_event_callback_add(sd->image, EVAS_CALLBACK_IMAGE_RESIZE, _image_resized_cb, sd);
}

static void _mainimg_smart_del(Evas_Object *obj)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	if (!sd)
		return;

	if (sd->loaded) {
		sd->loaded = EINA_FALSE;
		free(sd->path);
		sd->path = NULL;
		evas_object_hide(obj);
	}
	/* Nothing of a pending load may call back into this record. */
	_preload_release(sd);
	_processing_popup_del(sd);

	if (sd->image) {
		evas_object_event_callback_del_full(sd->image, EVAS_CALLBACK_IMAGE_RESIZE, _image_resized_cb, sd);
		evas_object_del(sd->image);
		sd->image = NULL;
	}
	_own_pixels_release_unshown(sd);
	if (sd->gesture) {
		Evas_Object *gesture = sd->gesture;
		sd->gesture = NULL;
		evas_object_event_callback_del_full(gesture, EVAS_CALLBACK_DEL, _gesture_deleted_cb, sd);
		evas_object_del(gesture);
	}
	evas_object_smart_data_set(obj, NULL);
	free(sd);
}

static void _mainimg_smart_move(Evas_Object *obj, Evas_Coord x, Evas_Coord y)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	if (!sd || (sd->x == x && sd->y == y))
		return;
	sd->x = x;
	sd->y = y;
	evas_object_smart_calculate(obj);
}

static void _mainimg_smart_resize(Evas_Object *obj, Evas_Coord w, Evas_Coord h)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	if (!sd || (sd->w == w && sd->h == h))
		return;
	sd->w = w;
	sd->h = h;
	evas_object_smart_calculate(obj);
}

static void _mainimg_smart_show(Evas_Object *obj)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	if (!sd || sd->visible)
		return;
	sd->visible = EINA_TRUE;
	evas_object_show(sd->image);
}

static void _mainimg_smart_hide(Evas_Object *obj)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	if (!sd || !sd->visible)
		return;
	sd->visible = EINA_FALSE;
	evas_object_hide(sd->image);
}

static void _mainimg_smart_clip_set(Evas_Object *obj, Evas_Object *clip)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	if (sd && sd->image)
		evas_object_clip_set(sd->image, clip);
}

static void _mainimg_smart_clip_unset(Evas_Object *obj)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	if (sd && sd->image)
		evas_object_clip_unset(sd->image);
}

static void _mainimg_smart_calculate(Evas_Object *obj)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	if (!sd || sd->w == 0 || sd->h == 0 || !sd->loaded)
		return;

	if (!sd->fitted && sd->scale > 0.0) {
		/* Keeps the zoom, clamped to a possibly new area. */
		_zoom_at(sd, sd->x, sd->y, sd->scale);
		return;
	}

	Fit_Rect fit;
	if (!_fit_rect_get(sd, &fit))
		return;
	sd->scale = fit.scale;
	evas_object_image_fill_set(sd->image, 0, 0, fit.w, fit.h);
	evas_object_resize(sd->image, fit.w, fit.h);
	evas_object_move(sd->image, fit.x, fit.y);
	evas_object_repeat_events_set(sd->image, EINA_TRUE);
}

Evas_Object *ie_image_add(Evas_Object *parent)
{
	IE_CHECK_NULL(parent);

	if (!_mainimg_smart) {
		_mainimg_class.name = eina_stringshare_add(MAINIMG_CLASS_NAME);
		_mainimg_smart = evas_smart_class_new(&_mainimg_class);
	}
	Evas_Object *obj = evas_object_smart_add(evas_object_evas_get(parent), _mainimg_smart);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	if (!sd) {
		IE_LOG_E("Cannot create main image");
		if (obj)
			evas_object_del(obj);
		return NULL;
	}
	evas_object_name_set(obj, "Image");
	sd->parent = parent;
	_create_event_obj(sd);
	return obj;
}

Evas_Object *ie_image_object_get(Evas_Object *obj)
{
	IE_CHECK_NULL(obj);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK_NULL(sd);
	return sd->image;
}

void ie_image_geometry_get(Evas_Object *obj, Evas_Coord *x, Evas_Coord *y, Evas_Coord *w, Evas_Coord *h)
{
	IE_CHECK(obj);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK(sd);
	evas_object_geometry_get(sd->image, x, y, w, h);
}

void ie_image_zoom_enabled_set(Evas_Object *obj, Eina_Bool enable)
{
	IE_CHECK(obj);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK(sd);
	if (!sd->gesture)
		return;

	elm_gesture_layer_cb_set(sd->gesture, ELM_GESTURE_ZOOM, ELM_GESTURE_STATE_START,
				 enable ? _zoom_start_cb : NULL, obj);
	elm_gesture_layer_cb_set(sd->gesture, ELM_GESTURE_ZOOM, ELM_GESTURE_STATE_MOVE,
				 enable ? _zoom_move_cb : NULL, obj);
	elm_gesture_layer_cb_set(sd->gesture, ELM_GESTURE_ZOOM, ELM_GESTURE_STATE_END,
				 enable ? _zoom_end_cb : NULL, obj);
	elm_gesture_layer_cb_set(sd->gesture, ELM_GESTURE_ZOOM, ELM_GESTURE_STATE_ABORT,
				 enable ? _gesture_noop_cb : NULL, obj);
}

void ie_image_double_tap_enabled_set(Eina_Bool enable, Evas_Object *obj)
{
	IE_CHECK(obj);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK(sd);
	if (!sd->gesture)
		return;

	elm_gesture_layer_cb_set(sd->gesture, ELM_GESTURE_N_DOUBLE_TAPS, ELM_GESTURE_STATE_END,
				 enable ? _double_tap_end_cb : NULL, obj);
}

void ie_image_mode_set(Evas_Object *obj, int mode)
{
	IE_CHECK(obj);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK(sd);
	if (mode == sd->mode)
		return;

	switch (mode) {
	case IE_IMAGE_MODE_PASSIVE:
		evas_object_pass_events_set(obj, EINA_TRUE);
		evas_object_smart_changed(obj);
		break;
	case IE_IMAGE_MODE_NORMAL:
	case IE_IMAGE_MODE_CROP:
		evas_object_pass_events_set(obj, EINA_FALSE);
		break;
	case IE_IMAGE_MODE_ACTIVE:
		evas_object_pass_events_set(obj, EINA_FALSE);
		evas_object_smart_changed(obj);
		break;
	default:
		break;
	}
	sd->mode = mode;
}

void ie_image_refit(Evas_Object *obj)
{
	IE_CHECK(obj);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK(sd);
	sd->fitted = EINA_TRUE;
	evas_object_smart_changed(obj);
}

void ie_image_size_update(Evas_Object *obj)
{
	IE_CHECK(obj);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK(sd);
	/* A view that put new pixels of the same size in through Evas comes
	 * here next. */
	_own_pixels_release_unshown(sd);
	evas_object_image_size_get(sd->image, &sd->img_w, &sd->img_h);
	sd->fitted = EINA_TRUE;
	evas_object_smart_changed(obj);
}
