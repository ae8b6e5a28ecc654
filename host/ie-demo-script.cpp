#include "ie-demo-script.h"

#include <cstdio>
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

bool tap_tool(Demo_Script *s, int index)
{
	Evas_Object *toolbar = elm_object_part_content_get(s->editor_view, "elm.swallow.ctrlbar");
	if (!toolbar)
		return false;
	Elm_Object_Item *item = elm_gengrid_first_item_get(toolbar);
	for (int i = 0; item && i < index; i++)
		item = elm_gengrid_item_next_get(item);
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
	{"effect", [](Demo_Script *s, const std::string &) { return tap_tool(s, 3); }},
	{"cancel", [](Demo_Script *s, const std::string &) { return tap_funcbar_button(s, "title_left_text_btn"); }},
	{"done", [](Demo_Script *s, const std::string &) { return tap_done(s); }},
	{"discard", [](Demo_Script *s, const std::string &) { return tap_popup_button(s, "deletepopup", "button2"); }},
	{"keep", [](Demo_Script *s, const std::string &) { return tap_popup_button(s, "deletepopup", "button1"); }},
	{"storage-ok",
	 [](Demo_Script *s, const std::string &) { return tap_popup_button(s, "okcancelpopup", "button1"); }},
	{"failed-ok",
	 [](Demo_Script *s, const std::string &) { return tap_popup_button(s, "savefailedpopup", "button1"); }},
	{"back", [](Demo_Script *s, const std::string &) { return press_back(s); }},
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
	return "crop rotate-left rotate-right effect cancel done discard keep storage-ok failed-ok back";
}

bool demo_script_run(Demo_Script *s, const std::vector<std::string> &actions)
{
	for (int tries = 0; tries < 200 && !picture_ready(s); tries++)
		loop_for(0.05);
	loop_for(0.1);

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
			char path[1024];
			snprintf(path, sizeof(path), "%s/step-%02d-%s.png", s->shots_dir.c_str(), step, name.c_str());
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
