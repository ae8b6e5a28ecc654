/* Touch input of the selection box. One finger, on the box's event
 * rectangle, takes hold of a handle, an edge or the inside and drags it:
 * the rectangle stays inside the visible picture, keeps a minimum size and,
 * in a fixed-ratio mode, its aspect ratio. A further finger, on the
 * picture, means the picture is being pinched: the single touch pauses and
 * the rectangle follows the picture's geometry. Nothing here allocates. */
#include <algorithm>

#include "ie-debug.h"
#include "ie-selectbox-private.h"

namespace {

/* A point grabs a handle when it lies strictly within this distance of it
 * along both axes. */
constexpr int GRAB_TOLERANCE = 30;
constexpr int MIN_SIZE = 40;
/* An edge drag that would leave the rectangle at most this long snaps to
 * MIN_SIZE. */
constexpr int SNAP_LIMIT = 39;

bool near(Evas_Coord pointer, Evas_Coord point)
{
	return point - GRAB_TOLERANCE < pointer && pointer < point + GRAB_TOLERANCE;
}

/* The part of the box under (ex, ey). Corners win over the top middle, the
 * top middle over the top-right corner, as on a narrow box they overlap. */
int hit_test(const Selectbox_Smart_Data *sd, Evas_Coord ex, Evas_Coord ey)
{
	const Evas_Coord l = sd->left, t = sd->top;
	const Evas_Coord hw = (sd->right - l) / 2, hh = (sd->bottom - t) / 2;

	if (near(ex, l) && near(ey, t))
		return GRAB_TOP_LEFT;
	if (near(ex, l + hw) && near(ey, t))
		return GRAB_TOP;
	if (near(ex, l + 2 * hw)) {
		if (near(ey, t))
			return GRAB_TOP_RIGHT;
		if (near(ey, t + hh))
			return GRAB_RIGHT;
		if (near(ey, t + 2 * hh))
			return GRAB_BOTTOM_RIGHT;
	}
	if (near(ex, l + hw) && near(ey, t + 2 * hh))
		return GRAB_BOTTOM;
	if (near(ex, l)) {
		if (near(ey, t + 2 * hh))
			return GRAB_BOTTOM_LEFT;
		if (near(ey, t + hh))
			return GRAB_LEFT;
	}
	if (l < ex && ex < sd->right && t < ey && ey < sd->bottom)
		return GRAB_INSIDE;
	return GRAB_NONE;
}

/* Where the rectangle may go: the picture, as far as it is on screen. */
struct Allowed_Area {
	Evas_Coord left, top, right, bottom;
};

Allowed_Area allowed_area(const Selectbox_Smart_Data *sd)
{
	Evas_Coord ix, iy, iw, ih;
	evas_object_geometry_get(sd->image, &ix, &iy, &iw, &ih);
	int sw, sh;
	_selectbox_screen_size_get(&sw, &sh);
	Allowed_Area a;
	a.left = std::max(ix, 0);
	a.top = std::max(iy, 0);
	a.right = a.left + std::min(sw, iw);
	a.bottom = a.top + std::min(sh, ih);
	return a;
}

/* The whole rectangle moves; where it is larger than the allowed area it
 * ends flush with the area's right (bottom) edge. */
void translate(Selectbox_Smart_Data *sd, const Allowed_Area &a, Evas_Coord dx, Evas_Coord dy)
{
	const Evas_Coord w = sd->right - sd->left, h = sd->bottom - sd->top;
	Evas_Coord l = std::max(sd->left + dx, a.left);
	Evas_Coord t = std::max(sd->top + dy, a.top);
	if (l + w > a.right)
		l = a.right - w;
	if (t + h > a.bottom)
		t = a.bottom - h;
	sd->left = l;
	sd->top = t;
	sd->right = l + w;
	sd->bottom = t + h;
}

struct Drag_Limits {
	Evas_Coord min_w, min_h;
};

/* The ratios with a minimum of their own also move the rectangle's corner
 * along their diagonal: the vertical movement follows the horizontal one. */
Drag_Limits drag_limits(const Selectbox_Smart_Data *sd, Evas_Coord dx, Evas_Coord *dy)
{
	if (sd->ratio_h == 1 && sd->ratio_w == 1) {
		*dy = dx;
		return {MIN_SIZE, MIN_SIZE};
	}
	if (sd->ratio_h == 3 && sd->ratio_w == 4) {
		*dy = 3 * dx / 4;
		return {134, 100};
	}
	if (sd->ratio_h == 9 && sd->ratio_w == 16) {
		*dy = 9 * dx / 16;
		return {178, 100};
	}
	return {MIN_SIZE, MIN_SIZE};
}

/* Resizes by the held corner; false when a fixed-ratio drag is refused and
 * nothing changed. In the fixed mode the top-right and bottom-left corners
 * take -dy, so that an outward drag grows both sides at the ratio. */
bool corner_drag(Selectbox_Smart_Data *sd, const Allowed_Area &a, const Drag_Limits &m, Evas_Coord dx, Evas_Coord dy)
{
	const Evas_Coord w = sd->right - sd->left, h = sd->bottom - sd->top;
	const bool fixed = sd->fixed;
	switch (sd->grab) {
	case GRAB_BOTTOM_RIGHT:
		if (m.min_w > w + dx)
			dx = 0;
		if (m.min_h > h + dy)
			dy = 0;
		if (sd->right + dx > a.right)
			dx = 0;
		if (sd->bottom + dy > a.bottom)
			dy = 0;
		if (fixed && (dx == 0 || dy == 0))
			return false;
		sd->right += dx;
		sd->bottom += dy;
		return true;
	case GRAB_TOP_LEFT:
		if (m.min_h > h - dy)
			dy = 0;
		if (m.min_w > w - dx)
			dx = 0;
		if (a.top > sd->top + dy)
			dy = 0;
		if (a.left > sd->left + dx)
			dx = 0;
		if (fixed && (dx == 0 || dy == 0))
			return false;
		sd->left += dx;
		sd->top += dy;
		return true;
	case GRAB_TOP_RIGHT:
		if (fixed) {
			if (m.min_h > h + dy || a.top > sd->top - dy)
				dy = 0;
		} else {
			if (m.min_h > h - dy || a.top > sd->top + dy)
				dy = 0;
		}
		if (m.min_w > w + dx || sd->right + dx > a.right)
			dx = 0;
		if (fixed && (dx == 0 || dy == 0))
			return false;
		sd->top += fixed ? -dy : dy;
		sd->right += dx;
		return true;
	case GRAB_BOTTOM_LEFT:
		if (m.min_w > w - dx || a.left > sd->left + dx)
			dx = 0;
		if (fixed) {
			if (m.min_h > h - dy)
				dy = 0;
			if (sd->bottom - dy > a.bottom || dx == 0 || dy == 0)
				return false;
			sd->left += dx;
			sd->bottom -= dy;
			return true;
		}
		sd->left += dx;
		if (m.min_h > h + dy)
			dy = 0;
		if (sd->bottom + dy <= a.bottom)
			sd->bottom += dy;
		return true;
	default:
		return false;
	}
}

/* Moves the held edge of a free rectangle; a drag that would leave it
 * narrower (lower) than the minimum snaps it to the minimum. */
void edge_drag(Selectbox_Smart_Data *sd, const Allowed_Area &a, Evas_Coord dx, Evas_Coord dy)
{
	const Evas_Coord w = sd->right - sd->left, h = sd->bottom - sd->top;
	switch (sd->grab) {
	case GRAB_RIGHT:
		if (w + dx <= SNAP_LIMIT) {
			sd->right = sd->left + MIN_SIZE;
			dx = 0;
		}
		sd->right = std::min(sd->right + dx, a.right);
		break;
	case GRAB_LEFT:
		if (w - dx <= SNAP_LIMIT) {
			sd->left = sd->right - MIN_SIZE;
			dx = 0;
		}
		sd->left = std::max(sd->left + dx, a.left);
		break;
	case GRAB_TOP:
		if (h - dy <= SNAP_LIMIT) {
			sd->top = sd->bottom - MIN_SIZE;
			dy = 0;
		}
		sd->top = std::max(sd->top + dy, a.top);
		break;
	case GRAB_BOTTOM:
		if (h + dy <= SNAP_LIMIT) {
			sd->bottom = sd->top + MIN_SIZE;
			dy = 0;
		}
		sd->bottom = std::min(sd->bottom + dy, a.bottom);
		break;
	default:
		break;
	}
}

bool is_edge(int grab)
{
	return grab == GRAB_TOP || grab == GRAB_LEFT || grab == GRAB_RIGHT || grab == GRAB_BOTTOM;
}

} // namespace

void _on_mouse_down(void *data, Evas *, Evas_Object *, void *event_info)
{
	Selectbox_Smart_Data *sd = _selectbox_own_data(static_cast<Evas_Object *>(data));
	auto *ev = static_cast<Evas_Event_Mouse_Down *>(event_info);
	if (!sd || !ev || sd->multi)
		return;
	sd->grab = hit_test(sd, ev->output.x, ev->output.y);
}

void _on_mouse_up(void *data, Evas *, Evas_Object *, void *)
{
	Selectbox_Smart_Data *sd = _selectbox_own_data(static_cast<Evas_Object *>(data));
	if (sd)
		sd->grab = GRAB_NONE;
}

/* A move that leaves the rectangle as it was (a finger still, or pushing
 * against the picture's edge) asks for no new layout. */
void _on_mouse_move(void *data, Evas *, Evas_Object *, void *event_info)
{
	Selectbox_Smart_Data *sd = _selectbox_own_data(static_cast<Evas_Object *>(data));
	auto *ev = static_cast<Evas_Event_Mouse_Move *>(event_info);
	if (!sd || !ev || sd->multi || sd->grab == GRAB_NONE || !sd->image)
		return;

	const Evas_Coord dx = ev->cur.output.x - ev->prev.output.x;
	Evas_Coord dy = ev->cur.output.y - ev->prev.output.y;
	const Allowed_Area area = allowed_area(sd);
	const Evas_Coord before[4] = {sd->left, sd->top, sd->right, sd->bottom};

	/* A fixed ratio has no edge handles: an edge held moves the box. */
	if (sd->fixed && is_edge(sd->grab))
		sd->grab = GRAB_INSIDE;
	if (sd->grab == GRAB_INSIDE) {
		translate(sd, area, dx, dy);
	} else {
		const Drag_Limits limits = drag_limits(sd, dx, &dy);
		if (is_edge(sd->grab))
			edge_drag(sd, area, dx, dy);
		else if (!corner_drag(sd, area, limits, dx, dy))
			return;
	}
	if (before[0] != sd->left || before[1] != sd->top || before[2] != sd->right || before[3] != sd->bottom)
		evas_object_smart_changed(sd->obj);
}

void _on_mouse_multi_down(void *data, Evas *, Evas_Object *, void *)
{
	IE_CHECK(data);
	Selectbox_Smart_Data *sd = _selectbox_data_get(static_cast<Evas_Object *>(data));
	IE_CHECK(sd);
	sd->multi = EINA_TRUE;
}

/* A finger still down on the box goes on dragging from here. */
void _on_mouse_multi_up(void *data, Evas *, Evas_Object *, void *)
{
	IE_CHECK(data);
	Selectbox_Smart_Data *sd = _selectbox_data_get(static_cast<Evas_Object *>(data));
	IE_CHECK(sd);
	sd->multi = EINA_FALSE;
	if (sd->image)
		_selectbox_area_record(sd);
}

/* The picture is being pinched: a rectangle that no longer fits becomes
 * half the picture's width, at its ratio (square in the free mode), and a
 * picture inside the screen takes the rectangle inside it. */
void _on_mouse_multi_move(void *data, Evas *, Evas_Object *, void *)
{
	IE_CHECK(data);
	Selectbox_Smart_Data *sd = _selectbox_data_get(static_cast<Evas_Object *>(data));
	IE_CHECK(sd);
	if (!sd->image)
		return;

	Evas_Coord ix, iy, iw, ih;
	evas_object_geometry_get(sd->image, &ix, &iy, &iw, &ih);
	Evas_Coord w = sd->right - sd->left, h = sd->bottom - sd->top;
	if (iw < w || ih < h) {
		w = iw / 2;
		/* A box without a usable ratio follows the free mode's rule. */
		h = (sd->ratio_h != 0 && sd->ratio_w != 0) ? sd->ratio_h * w / sd->ratio_w : w;
	}

	Evas_Coord l = sd->left, t = sd->top;
	if (ix > 0) {
		if (sd->left < ix)
			l = ix;
		if (ix + iw < sd->right)
			l = ix + iw - w;
	}
	if (iy > 0) {
		if (sd->top < iy)
			t = iy;
		if (iy + ih < sd->bottom)
			t = iy + ih - h;
	}
	sd->left = l;
	sd->top = t;
	sd->right = l + w;
	sd->bottom = t + h;
	evas_object_smart_changed(sd->obj);
}
