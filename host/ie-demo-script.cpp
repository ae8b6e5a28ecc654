#include "ie-demo-script.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

unsigned int event_clock = 1000;

void loop_for(double seconds)
{
	double end = ecore_time_get() + seconds;
	ecore_timer_add(0.005, [](void *data) -> Eina_Bool {
		if (ecore_time_get() < *static_cast<double *>(data))
			return ECORE_CALLBACK_RENEW;
		ecore_main_loop_quit();
		return ECORE_CALLBACK_CANCEL;
	}, &end);
	ecore_main_loop_begin();
	edje_message_signal_process();
}

/* Runs the loop until `ready()` holds or `seconds` have passed (a busy
 * machine runs the editor's idlers late); whether it holds. */
template <class Ready>
bool loop_until(Ready ready, double seconds = 10.0)
{
	for (double waited = 0.0; !ready(); waited += 0.05) {
		if (waited >= seconds)
			return false;
		loop_for(0.05);
	}
	return true;
}

void tap_at(Evas_Object *win, int x, int y)
{
	Evas *e = evas_object_evas_get(win);
	evas_event_feed_mouse_move(e, x, y, event_clock += 10, nullptr);
	evas_event_feed_mouse_down(e, 1, EVAS_BUTTON_NONE, event_clock += 10, nullptr);
	evas_event_feed_mouse_up(e, 1, EVAS_BUTTON_NONE, event_clock += 10, nullptr);
}

bool tap_object(Evas_Object *win, Evas_Object *obj)
{
	if (!obj || !evas_object_visible_get(obj))
		return false;
	Evas_Coord x, y, w, h;
	evas_object_geometry_get(obj, &x, &y, &w, &h);
	if (w <= 0 || h <= 0)
		return false;
	tap_at(win, x + w / 2, y + h / 2);
	return true;
}

Elm_Object_Item *nth_item(Evas_Object *grid, int index)
{
	Elm_Object_Item *item = elm_gengrid_first_item_get(grid);
	for (int i = 0; item && i < index; i++)
		item = elm_gengrid_item_next_get(item);
	return item;
}

bool tap_tool(Demo_Script *s, int index)
{
	Evas_Object *toolbar = elm_object_part_content_get(s->editor_view, "elm.swallow.ctrlbar");
	if (!toolbar)
		return false;
	Elm_Object_Item *item = nth_item(toolbar, index);
	if (!item)
		return false;
	Evas_Object *track = elm_object_item_track(item);
	bool tapped = tap_object(s->win, track);
	elm_object_item_untrack(item);
	return tapped;
}

bool tap_funcbar_button(Demo_Script *s, const char *part)
{
	Evas_Object *funcbar = elm_object_part_content_get(s->editor_view, "elm.swallow.tabbar");
	return funcbar && tap_object(s->win, elm_object_part_content_get(funcbar, part));
}

/* Done saves and comes back at once; the editor then waits, Done disabled
 * and no popup up, until the saved file is registered. */
bool save_pending(Demo_Script *s)
{
	Evas_Object *funcbar = elm_object_part_content_get(s->editor_view, "elm.swallow.tabbar");
	Evas_Object *done = funcbar ? elm_object_part_content_get(funcbar, "title_right_text_btn") : nullptr;
	Evas *e = evas_object_evas_get(s->win);
	return !*s->closed && done && elm_object_disabled_get(done) && !evas_object_name_find(e, "okcancelpopup") &&
	       !evas_object_name_find(e, "savefailedpopup");
}

bool tap_done(Demo_Script *s)
{
	if (!tap_funcbar_button(s, "title_right_text_btn"))
		return false;
	loop_for(0.05);
	for (int tries = 0; tries < 400 && save_pending(s); tries++)
		loop_for(0.05);
	return true;
}

bool tap_popup_button(Demo_Script *s, const char *popup_name, const char *part)
{
	Evas_Object *popup = evas_object_name_find(evas_object_evas_get(s->win), popup_name);
	return popup && tap_object(s->win, elm_object_part_content_get(popup, part));
}

bool press_back(Demo_Script *s)
{
	Evas *e = evas_object_evas_get(s->win);
	evas_event_feed_key_down(e, "Escape", "Escape", nullptr, nullptr, event_clock += 10, nullptr);
	evas_event_feed_key_up(e, "Escape", "Escape", nullptr, nullptr, event_clock += 10, nullptr);
	return true;
}

/* A finger pressed at (x0, y0), moved to (x1, y1) in `steps` moves `ms`
 * apart and lifted. With `scrolling` the loop runs between the moves, as
 * a scroller follows the finger only on its animator's ticks, and the
 * finger rests a moment before it lifts, so that nothing flicks on. */
void slide_at(Evas_Object *win, int x0, int y0, int x1, int y1, int steps, unsigned int ms, bool scrolling)
{
	Evas *e = evas_object_evas_get(win);
	evas_event_feed_mouse_move(e, x0, y0, event_clock += ms, nullptr);
	evas_event_feed_mouse_down(e, 1, EVAS_BUTTON_NONE, event_clock += ms, nullptr);
	for (int i = 1; i <= steps; i++) {
		evas_event_feed_mouse_move(e, x0 + (x1 - x0) * i / steps, y0 + (y1 - y0) * i / steps, event_clock += ms,
					   nullptr);
		if (scrolling)
			loop_for(ms / 1000.0);
		else
			edje_message_signal_process();
	}
	if (scrolling) {
		evas_event_feed_mouse_move(e, x1, y1, event_clock += 300, nullptr);
		loop_for(0.1);
	}
	evas_event_feed_mouse_up(e, 1, EVAS_BUTTON_NONE, event_clock += ms, nullptr);
}

bool parse_int(const std::string &text, int *value)
{
	char *end = nullptr;
	long v = strtol(text.c_str(), &end, 10);
	if (text.empty() || *end || v < -100000 || v > 100000)
		return false;
	*value = static_cast<int>(v);
	return true;
}

/* The crop box's rectangle, read from its edge lines (top, left, bottom,
 * right in the order they were made). */
bool crop_box_rect(Demo_Script *s, int *l, int *t, int *r, int *b)
{
	Evas_Object *box = evas_object_name_find(evas_object_evas_get(s->win), "SelectBox");
	if (!box || !evas_object_visible_get(box))
		return false;
	Evas_Coord top[4] = {}, left[4] = {};
	int lines = 0;
	Eina_List *members = evas_object_smart_members_get(box);
	void *member;
	EINA_LIST_FREE(members, member) {
		auto *o = static_cast<Evas_Object *>(member);
		const char *type = evas_object_type_get(o);
		if (!type || strcmp(type, "line"))
			continue;
		Evas_Coord *xy = lines == 0 ? top : lines == 1 ? left : nullptr;
		if (xy)
			evas_object_line_xy_get(o, &xy[0], &xy[1], &xy[2], &xy[3]);
		lines++;
	}
	if (lines != 4)
		return false;
	*l = top[0];
	*t = top[1];
	*r = top[2];
	*b = left[3];
	return true;
}

/* drag:PART:DX:DY with PART one of the box's handles or "inside". */
bool drag_crop_box(Demo_Script *s, const std::string &arg)
{
	size_t first = arg.find(':'), second = first == std::string::npos ? first : arg.find(':', first + 1);
	int dx = 0, dy = 0;
	if (second == std::string::npos || !parse_int(arg.substr(first + 1, second - first - 1), &dx) ||
	    !parse_int(arg.substr(second + 1), &dy))
		return false;
	const std::string part = arg.substr(0, first);
	int l, t, r, b;
	if (!loop_until([&] { return crop_box_rect(s, &l, &t, &r, &b); }))
		return false;
	const int mx = l + (r - l) / 2, my = t + (b - t) / 2;
	const struct {
		const char *name;
		int x, y;
	} points[] = {
		{"top-left", l, t}, {"top", mx, t}, {"top-right", r, t}, {"left", l, my}, {"right", r, my},
		{"bottom-left", l, b}, {"bottom", mx, b}, {"bottom-right", r, b}, {"inside", mx, my},
	};
	for (const auto &p : points) {
		if (part == p.name) {
			slide_at(s->win, p.x, p.y, p.x + dx, p.y + dy, 10, 10, false);
			return true;
		}
	}
	return false;
}

/* The effect grid's items in order, by the English names of the actions. */
constexpr const char *effect_names[] = {
	"vintage", "sunshine", "nostalgia", "yellow-glow", "blur", "soft-glow", "old-photo",
	"retro", "greyscale", "sepia", "faded-colours", "downlight", "sharpen", "sketch",
	"negative", "oil-paint", "posterise", "cartoon", "pop-art", "magic-pen",
};

Evas_Object *effect_grid(Demo_Script *s)
{
	Evas_Object *grid = elm_object_part_content_get(s->editor_view, "elm.swallow.effecttray");
	return grid && evas_object_visible_get(grid) ? grid : nullptr;
}

/* Lets the grid's own scrolling end. */
void wait_for_grid(Evas_Object *grid)
{
	Evas_Coord last_x = -1, last_y = -1;
	for (int tries = 0; tries < 40; tries++) {
		loop_for(0.05);
		Evas_Coord x, y;
		elm_scroller_region_get(grid, &x, &y, nullptr, nullptr);
		if (x == last_x && y == last_y)
			return;
		last_x = x;
		last_y = y;
	}
}

/* Opens the effect view if needed, swipes the grid until the effect's item
 * is wholly on screen, and taps it. */
bool tap_effect(Demo_Script *s, const std::string &name)
{
	int index = -1;
	for (int i = 0; i < int(sizeof(effect_names) / sizeof(effect_names[0])); i++)
		if (name == effect_names[i])
			index = i;
	if (index < 0) {
		fprintf(stderr, "ie-demo-host: no effect '%s'\n", name.c_str());
		return false;
	}
	Evas_Object *grid = effect_grid(s);
	if (!grid) {
		if (!tap_tool(s, 3) || !loop_until([&] { return (grid = effect_grid(s)) != nullptr; }))
			return false;
	}
	wait_for_grid(grid);

	Elm_Object_Item *item = nth_item(grid, index);
	if (!item)
		return false;
	bool horizontal = elm_gengrid_horizontal_get(grid);
	Evas_Coord gx, gy, gw, gh;
	evas_object_geometry_get(grid, &gx, &gy, &gw, &gh);
	for (int swipes = 0; swipes < 20; swipes++) {
		Evas_Coord ix = 0, iy = 0, iw = 0, ih = 0;
		Evas_Object *track = elm_object_item_track(item);
		if (track)
			evas_object_geometry_get(track, &ix, &iy, &iw, &ih);
		elm_object_item_untrack(item);
		bool realized = track && iw > 0 && ih > 0;
		if (realized && ix >= gx && iy >= gy && ix + iw <= gx + gw && iy + ih <= gy + gh) {
			tap_at(s->win, ix + iw / 2, iy + ih / 2);
			return true;
		}

		/* Swipe the item towards the middle, at most three quarters of the
		 * grid at a time; an item not laid out yet lies beyond the last one
		 * that is. */
		int length = horizontal ? gw : gh;
		int offset;
		if (realized) {
			offset = horizontal ? (ix + iw / 2) - (gx + gw / 2) : (iy + ih / 2) - (gy + gh / 2);
		} else {
			Eina_List *shown = elm_gengrid_realized_items_get(grid);
			int first_shown = -1, i = 0;
			for (Elm_Object_Item *it = elm_gengrid_first_item_get(grid); it && first_shown < 0;
			     it = elm_gengrid_item_next_get(it), i++)
				if (eina_list_data_find(shown, it))
					first_shown = i;
			eina_list_free(shown);
			offset = index < first_shown ? -length : length;
		}
		offset = std::max(-length * 3 / 8, std::min(length * 3 / 8, offset / 2));
		int cx = gx + gw / 2, cy = gy + gh / 2;
		if (horizontal)
			slide_at(s->win, cx + offset, cy, cx - offset, cy, 15, 30, true);
		else
			slide_at(s->win, cx, cy + offset, cx, cy - offset, 15, 30, true);
		wait_for_grid(grid);
	}
	return false;
}

/* pinch:FACTOR: two fingers 200 pixels apart about the middle of the
 * picture's visible part, spread (or closed) to FACTOR times that. */
bool pinch_picture(Demo_Script *s, const std::string &arg)
{
	char *end = nullptr;
	double factor = strtod(arg.c_str(), &end);
	if (arg.empty() || *end || !(factor > 0.0 && factor <= 10.0))
		return false;
	Evas *e = evas_object_evas_get(s->win);
	Evas_Object *image = evas_object_name_find(e, "mImage");
	if (!image || !evas_object_visible_get(image))
		return false;
	Evas_Coord x, y, w, h, ww, wh;
	evas_object_geometry_get(image, &x, &y, &w, &h);
	evas_object_geometry_get(s->win, nullptr, nullptr, &ww, &wh);
	const int x0 = std::max(x, 0), y0 = std::max(y, 0);
	const int x1 = std::min(x + w, ww), y1 = std::min(y + h, wh);
	if (x1 <= x0 || y1 <= y0)
		return false;
	const int cx = (x0 + x1) / 2, cy = (y0 + y1) / 2;
	const int gap0 = 200, gap1 = static_cast<int>(gap0 * factor);
	evas_event_feed_mouse_move(e, cx - gap0 / 2, cy, event_clock += 10, nullptr);
	evas_event_feed_mouse_down(e, 1, EVAS_BUTTON_NONE, event_clock += 10, nullptr);
	evas_event_feed_multi_down(e, 1, cx + gap0 / 2, cy, 1, 1, 1, 1, 0, cx + gap0 / 2, cy, EVAS_BUTTON_NONE,
				   event_clock += 10, nullptr);
	const int steps = 10;
	int gap = gap0;
	for (int i = 1; i <= steps; i++) {
		gap = gap0 + (gap1 - gap0) * i / steps;
		evas_event_feed_mouse_move(e, cx - gap / 2, cy, event_clock += 10, nullptr);
		evas_event_feed_multi_move(e, 1, cx + gap / 2, cy, 1, 1, 1, 1, 0, cx + gap / 2, cy, event_clock += 10,
					   nullptr);
	}
	evas_event_feed_multi_up(e, 1, cx + gap / 2, cy, 1, 1, 1, 1, 0, cx + gap / 2, cy, EVAS_BUTTON_NONE,
				 event_clock += 10, nullptr);
	evas_event_feed_mouse_up(e, 1, EVAS_BUTTON_NONE, event_clock += 10, nullptr);
	return true;
}

/* A finger over the picture moved `dx` pixels sideways, a pixel or so per
 * move as a real finger reports it. */
bool drag_intensity(Demo_Script *s, const std::string &arg)
{
	char *end = nullptr;
	long dx = strtol(arg.c_str(), &end, 10);
	if (arg.empty() || *end) {
		fprintf(stderr, "ie-demo-host: intensity needs a whole number of pixels, not '%s'\n", arg.c_str());
		return false;
	}
	Evas_Object *area = evas_object_name_find(evas_object_evas_get(s->win), "effect_touch_layout");
	if (!area || !evas_object_visible_get(area))
		return false;
	Evas_Coord x, y, w, h;
	evas_object_geometry_get(area, &x, &y, &w, &h);
	int x0 = x + w / 2 - int(dx) / 2, cy = y + h / 2;
	slide_at(s->win, x0, cy, x0 + int(dx), cy, std::max(1, int(std::labs(dx)) / 2), 10, false);
	return true;
}

/* An action is NAME or NAME:ARGUMENT; `arg` is the text after the colon
 * ("" without one). */
struct Action {
	const char *name;
	bool (*run)(Demo_Script *, const std::string &arg);
};

constexpr Action actions_table[] = {
	{"crop", [](Demo_Script *s, const std::string &) { return tap_tool(s, 0); }},
	{"rotate-left", [](Demo_Script *s, const std::string &) { return tap_tool(s, 1); }},
	{"rotate-right", [](Demo_Script *s, const std::string &) { return tap_tool(s, 2); }},
	{"effect",
	 [](Demo_Script *s, const std::string &arg) { return arg.empty() ? tap_tool(s, 3) : tap_effect(s, arg); }},
	{"intensity", [](Demo_Script *s, const std::string &arg) { return drag_intensity(s, arg); }},
	{"cancel", [](Demo_Script *s, const std::string &) { return tap_funcbar_button(s, "title_left_text_btn"); }},
	{"done", [](Demo_Script *s, const std::string &) { return tap_done(s); }},
	{"discard", [](Demo_Script *s, const std::string &) { return tap_popup_button(s, "deletepopup", "button2"); }},
	{"keep", [](Demo_Script *s, const std::string &) { return tap_popup_button(s, "deletepopup", "button1"); }},
	{"storage-ok",
	 [](Demo_Script *s, const std::string &) { return tap_popup_button(s, "okcancelpopup", "button1"); }},
	{"failed-ok",
	 [](Demo_Script *s, const std::string &) { return tap_popup_button(s, "savefailedpopup", "button1"); }},
	{"back", [](Demo_Script *s, const std::string &) { return press_back(s); }},
	{"drag", drag_crop_box},
	{"pinch", pinch_picture},
};

const Action *action_find(const std::string &step, std::string *arg)
{
	size_t colon = step.find(':');
	std::string name = step.substr(0, colon);
	*arg = colon == std::string::npos ? std::string() : step.substr(colon + 1);
	for (const auto &a : actions_table)
		if (name == a.name)
			return &a;
	return nullptr;
}

/* The picture is in place when the editor's image holds pixels (a large
 * picture arrives later, from the preload). */
bool picture_ready(Demo_Script *s)
{
	Evas_Object *image = evas_object_name_find(evas_object_evas_get(s->win), "mImage");
	if (!image)
		return *s->closed;
	int w = 0, h = 0;
	evas_object_image_size_get(image, &w, &h);
	return w > 0 && h > 0 && evas_object_image_data_get(image, EINA_FALSE);
}

} // namespace

const char *demo_actions_help(void)
{
	return "crop rotate-left rotate-right effect effect:NAME intensity:DX cancel done discard keep storage-ok "
	       "failed-ok back drag:PART:DX:DY pinch:FACTOR";
}

bool demo_script_run(Demo_Script *s, const std::vector<std::string> &actions)
{
	/* The script plays a touch screen: lists scroll under a dragging finger. */
	elm_config_scroll_thumbscroll_enabled_set(EINA_TRUE);
	loop_until([s] { return picture_ready(s); });
	loop_for(0.1);
	/* Closed before any step (a picture that could not be opened): the
	 * host has said why; there is nothing to play. */
	if (*s->closed)
		return actions.empty();

	int step = 0;
	for (const auto &name : actions) {
		std::string arg;
		const Action *action = action_find(name, &arg);
		if (!action) {
			fprintf(stderr, "ie-demo-host: unknown action '%s' (known: %s)\n", name.c_str(), demo_actions_help());
			return false;
		}
		if (*s->closed || !action->run(s, arg)) {
			fprintf(stderr, "ie-demo-host: cannot %s: not on screen\n", name.c_str());
			return false;
		}
		loop_for(0.1);
		step++;
		printf("step %d: %s\n", step, name.c_str());
		if (!s->shots_dir.empty() && !*s->closed) {
			/* An argument's colons stay out of the file name. */
			std::string label = name;
			std::replace(label.begin(), label.end(), ':', '_');
			char path[1024];
			snprintf(path, sizeof(path), "%s/step-%02d-%s.png", s->shots_dir.c_str(), step, label.c_str());
			if (demo_screenshot(s->win, path))
				printf("screenshot: %s\n", path);
		}
	}
	return true;
}

bool demo_screenshot(Evas_Object *win, const char *path)
{
	Ecore_Evas *ee = ecore_evas_ecore_evas_get(evas_object_evas_get(win));
	int w = 0, h = 0;
	ecore_evas_geometry_get(ee, nullptr, nullptr, &w, &h);
	const void *pixels = ecore_evas_buffer_pixels_get(ee);
	if (!pixels || w <= 0 || h <= 0)
		return false;
	Ecore_Evas *out = ecore_evas_buffer_new(1, 1);
	Evas_Object *img = evas_object_image_add(ecore_evas_get(out));
	evas_object_image_alpha_set(img, EINA_FALSE);
	evas_object_image_size_set(img, w, h);
	evas_object_image_data_copy_set(img, const_cast<void *>(pixels));
	evas_object_image_data_update_add(img, 0, 0, w, h);
	bool saved = evas_object_image_save(img, path, nullptr, nullptr);
	ecore_evas_free(out);
	return saved;
}
