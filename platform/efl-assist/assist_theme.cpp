/* efl-assist for this platform.
 *
 * Theme tables are XML files of the application:
 *
 *   <ColorTable>
 *     <ColorCode id="AO004">
 *       <Color r="0" g="0" b="0" a="255"/>
 *       <OutlineColor r="0" g="0" b="0" a="255"/>   (optional, default 0,0,0,0)
 *       <ShadowColor r="0" g="0" b="0" a="255"/>    (optional, default 0,0,0,0)
 *     </ColorCode>
 *     ...
 *   </ColorTable>
 *
 *   <FontTable>
 *     <FontCode id="T0211" font="Sans:style=Bold" size="28"/>
 *     ...
 *   </FontTable>
 *
 * Channels are integers 0 to 255, sizes positive integers, ids unique and
 * not empty. Anything else (unknown elements or attributes, a missing
 * Color, text between elements) makes the whole file malformed: a table
 * with a typo would otherwise colour the UI wrongly without a word.
 *
 * Applying a table to an object sets the Edje colour classes (text classes)
 * named after its codes on the object's Edje object, and attaches a copy
 * of the table to the object for ea_theme_object_color_get. */
#include "assist_theme.h"

// This header has no C++ guard of its own; its weak declaration would
// otherwise bind to a mangled name that never resolves.
extern "C" {
#include <efl_ui_layout_base.eo.h>
}
#include <glib.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace {

/* ---- Tables ---------------------------------------------------------- */

using Rgba = std::array<int, 4>;

struct ColorEntry {
	Rgba color = {0, 0, 0, 0};
	Rgba outline = {0, 0, 0, 0};
	Rgba shadow = {0, 0, 0, 0};
};

struct FontEntry {
	std::string font;
	int size = 0;
};

using ColorMap = std::map<std::string, ColorEntry>;
using FontMap = std::map<std::string, FontEntry>;

} // namespace

// Objects keep a shared reference to the entries, so freeing a table while
// objects it was applied to live on is safe.
struct _Assist_Colour_Table {
	std::shared_ptr<const ColorMap> colors;
};

struct _Assist_Font_Table {
	std::shared_ptr<const FontMap> fonts;
};

namespace {

struct GFreeDeleter {
	void operator()(gchar *text) const { g_free(text); }
};

struct ParseState {
	ColorMap colors;
	FontMap fonts;
	std::vector<std::string> open; // element stack
	std::string current_code;
	bool current_has_color = false;
	const char *root = nullptr;
};

void set_error(GError **error, const char *message, const gchar *what)
{
	g_set_error(error, G_MARKUP_ERROR, G_MARKUP_ERROR_INVALID_CONTENT, "%s: %s", message, what);
}

bool parse_int(const gchar *text, int min, int max, int *out)
{
	if (!text || !*text)
		return false;
	char *end = nullptr;
	errno = 0;
	long value = strtol(text, &end, 10);
	if (errno || *end || value < min || value > max)
		return false;
	*out = static_cast<int>(value);
	return true;
}

bool parse_rgba(const gchar *element, const gchar **names, const gchar **values, Rgba *out, GError **error)
{
	const gchar *r, *g, *b, *a;
	if (!g_markup_collect_attributes(element, names, values, error,
					 G_MARKUP_COLLECT_STRING, "r", &r, G_MARKUP_COLLECT_STRING, "g", &g,
					 G_MARKUP_COLLECT_STRING, "b", &b, G_MARKUP_COLLECT_STRING, "a", &a,
					 G_MARKUP_COLLECT_INVALID, nullptr))
		return false;
	const gchar *channels[] = {r, g, b, a};
	for (int i = 0; i < 4; i++) {
		if (!parse_int(channels[i], 0, 255, &(*out)[i])) {
			set_error(error, "colour channel out of 0..255", channels[i]);
			return false;
		}
	}
	return true;
}

void start_color_element(const gchar *element, const gchar **names, const gchar **values, ParseState *state,
			 GError **error)
{
	const std::string parent = state->open.empty() ? "" : state->open.back();
	if (parent.empty()) {
		if (strcmp(element, "ColorTable") != 0)
			set_error(error, "expected ColorTable", element);
		else
			g_markup_collect_attributes(element, names, values, error, G_MARKUP_COLLECT_INVALID, nullptr);
		return;
	}
	if (parent == "ColorTable" && strcmp(element, "ColorCode") == 0) {
		const gchar *id;
		if (!g_markup_collect_attributes(element, names, values, error, G_MARKUP_COLLECT_STRING, "id", &id,
						 G_MARKUP_COLLECT_INVALID, nullptr))
			return;
		if (!*id || state->colors.count(id)) {
			set_error(error, "empty or repeated colour code", id);
			return;
		}
		state->current_code = id;
		state->current_has_color = false;
		state->colors[id] = ColorEntry();
		return;
	}
	if (parent == "ColorCode") {
		ColorEntry &entry = state->colors[state->current_code];
		Rgba *target = nullptr;
		if (strcmp(element, "Color") == 0) {
			target = &entry.color;
			state->current_has_color = true;
		} else if (strcmp(element, "OutlineColor") == 0) {
			target = &entry.outline;
		} else if (strcmp(element, "ShadowColor") == 0) {
			target = &entry.shadow;
		}
		if (target) {
			parse_rgba(element, names, values, target, error);
			return;
		}
	}
	g_set_error(error, G_MARKUP_ERROR, G_MARKUP_ERROR_UNKNOWN_ELEMENT, "unexpected element %s", element);
}

void start_font_element(const gchar *element, const gchar **names, const gchar **values, ParseState *state,
			GError **error)
{
	const std::string parent = state->open.empty() ? "" : state->open.back();
	if (parent.empty()) {
		if (strcmp(element, "FontTable") != 0)
			set_error(error, "expected FontTable", element);
		else
			g_markup_collect_attributes(element, names, values, error, G_MARKUP_COLLECT_INVALID, nullptr);
		return;
	}
	if (parent == "FontTable" && strcmp(element, "FontCode") == 0) {
		const gchar *id, *font, *size;
		if (!g_markup_collect_attributes(element, names, values, error, G_MARKUP_COLLECT_STRING, "id", &id,
						 G_MARKUP_COLLECT_STRING, "font", &font, G_MARKUP_COLLECT_STRING,
						 "size", &size, G_MARKUP_COLLECT_INVALID, nullptr))
			return;
		FontEntry entry;
		entry.font = font;
		if (!*id || state->fonts.count(id) || entry.font.empty() || !parse_int(size, 1, 10000, &entry.size)) {
			set_error(error, "bad font code", id);
			return;
		}
		state->fonts[id] = entry;
		return;
	}
	g_set_error(error, G_MARKUP_ERROR, G_MARKUP_ERROR_UNKNOWN_ELEMENT, "unexpected element %s", element);
}

void on_start_element(GMarkupParseContext *, const gchar *element, const gchar **names, const gchar **values,
		      gpointer data, GError **error)
{
	auto *state = static_cast<ParseState *>(data);
	if (strcmp(state->root, "ColorTable") == 0)
		start_color_element(element, names, values, state, error);
	else
		start_font_element(element, names, values, state, error);
	state->open.push_back(element);
}

void on_end_element(GMarkupParseContext *, const gchar *element, gpointer data, GError **error)
{
	auto *state = static_cast<ParseState *>(data);
	state->open.pop_back();
	if (strcmp(element, "ColorCode") == 0 && !state->current_has_color)
		set_error(error, "colour code without Color", state->current_code.c_str());
}

void on_text(GMarkupParseContext *, const gchar *text, gsize len, gpointer, GError **error)
{
	for (gsize i = 0; i < len; i++) {
		if (!g_ascii_isspace(text[i])) {
			g_set_error(error, G_MARKUP_ERROR, G_MARKUP_ERROR_INVALID_CONTENT, "unexpected text");
			return;
		}
	}
}

// Parses `file` whose root element must be `root`; false when the file is
// missing or malformed.
bool parse_table(const char *file, const char *root, ParseState *state)
{
	if (!file)
		return false;
	gchar *raw = nullptr;
	gsize length = 0;
	if (!g_file_get_contents(file, &raw, &length, nullptr))
		return false;
	std::unique_ptr<gchar, GFreeDeleter> contents(raw);

	static const GMarkupParser parser = {on_start_element, on_end_element, on_text, nullptr, nullptr};
	state->root = root;
	GMarkupParseContext *context = g_markup_parse_context_new(&parser, G_MARKUP_PREFIX_ERROR_POSITION, state, nullptr);
	GError *error = nullptr;
	bool ok = g_markup_parse_context_parse(context, contents.get(), static_cast<gssize>(length), &error) &&
		  g_markup_parse_context_end_parse(context, &error);
	g_markup_parse_context_free(context);
	if (error) {
		EINA_LOG_WARN("%s: %s", file, error->message);
		g_error_free(error);
	}
	return ok;
}

/* ---- Per-object theme state ------------------------------------------ */

constexpr char state_key[] = "ea.theme.state";

struct ObjectTheme {
	std::shared_ptr<const ColorMap> colors;
	std::shared_ptr<const FontMap> fonts;
	bool changeable = false;
	Assist_Style style = ASSIST_STYLE_DEFAULT;
};

const ObjectTheme *object_theme_find(const Evas_Object *obj)
{
	return static_cast<const ObjectTheme *>(evas_object_data_get(obj, state_key));
}

void object_theme_free(void *data, Evas *, Evas_Object *obj, void *)
{
	evas_object_data_del(obj, state_key);
	delete static_cast<ObjectTheme *>(data);
}

ObjectTheme *object_theme_get(Evas_Object *obj)
{
	auto *theme = static_cast<ObjectTheme *>(evas_object_data_get(obj, state_key));
	if (!theme) {
		theme = new ObjectTheme();
		evas_object_data_set(obj, state_key, theme);
		evas_object_event_callback_add(obj, EVAS_CALLBACK_DEL, object_theme_free, theme);
	}
	return theme;
}

bool is_edje(const Evas_Object *obj)
{
	const char *type = evas_object_type_get(obj);
	return type && strcmp(type, "edje") == 0;
}

// The Edje object whose classes theme `obj`: itself, or a layout's own.
Evas_Object *edje_of(Evas_Object *obj)
{
	if (is_edje(obj))
		return obj;
	if (elm_object_widget_check(obj) && efl_isa(obj, EFL_UI_LAYOUT_BASE_CLASS))
		return elm_layout_edje_get(obj);
	return nullptr;
}

Evas_Object *parent_of(const Evas_Object *obj)
{
	Evas_Object *parent = evas_object_smart_parent_get(obj);
	if (!parent && elm_object_widget_check(obj))
		parent = elm_object_parent_widget_get(obj);
	return parent;
}

const ColorMap *nearest_colors(const Evas_Object *obj)
{
	for (const Evas_Object *o = obj; o; o = parent_of(o)) {
		const ObjectTheme *theme = object_theme_find(o);
		if (theme && theme->colors)
			return theme->colors.get();
	}
	return nullptr;
}

bool valid_style(Assist_Style style)
{
	return style == ASSIST_STYLE_DEFAULT || style == ASSIST_STYLE_LIGHT || style == ASSIST_STYLE_DARK;
}

/* ---- Hardware keys --------------------------------------------------- */

struct KeyRegistration {
	Evas_Object *obj;
	Evas_Object *win;
	Assist_Key type;
	Assist_Key_Cb func;
	void *data;
};

struct KeyWindow {
	Evas_Object *win;
	int registrations;
};

constexpr const char *back_keys[] = {"Escape", "XF86Back"};
constexpr const char *more_keys[] = {"Menu", "XF86Menu"};
constexpr const char *grabbed_keys[] = {"Escape", "XF86Back", "Menu", "XF86Menu"};

// In the order of registration: a key goes to the newest live one.
std::vector<KeyRegistration *> key_registrations;
std::vector<KeyWindow> key_windows;

void on_window_key_down(void *, Evas *, Evas_Object *win, void *event_info);
void on_window_del(void *, Evas *, Evas_Object *win, void *);

// Not exclusive: the focused widget still sees the keys as well.
void window_grab(Evas_Object *win, bool grab)
{
	for (const char *key : grabbed_keys) {
		if (!grab)
			evas_object_key_ungrab(win, key, 0, 0);
		else if (!evas_object_key_grab(win, key, 0, 0, EINA_FALSE))
			EINA_LOG_WARN("cannot grab key %s", key);
	}
	if (grab) {
		evas_object_event_callback_add(win, EVAS_CALLBACK_KEY_DOWN, on_window_key_down, nullptr);
		evas_object_event_callback_add(win, EVAS_CALLBACK_DEL, on_window_del, nullptr);
	} else {
		evas_object_event_callback_del(win, EVAS_CALLBACK_KEY_DOWN, on_window_key_down);
		evas_object_event_callback_del(win, EVAS_CALLBACK_DEL, on_window_del);
	}
}

void window_attach(Evas_Object *win)
{
	auto it = std::find_if(key_windows.begin(), key_windows.end(), [win](const KeyWindow &w) { return w.win == win; });
	if (it != key_windows.end()) {
		it->registrations++;
		return;
	}
	window_grab(win, true);
	key_windows.push_back({win, 1});
}

void window_detach(Evas_Object *win)
{
	auto it = std::find_if(key_windows.begin(), key_windows.end(), [win](const KeyWindow &w) { return w.win == win; });
	if (it == key_windows.end() || --it->registrations > 0)
		return;
	// The window is left as it was found once nobody listens for keys.
	window_grab(win, false);
	key_windows.erase(it);
}

void on_window_del(void *, Evas *, Evas_Object *win, void *)
{
	key_windows.erase(std::remove_if(key_windows.begin(), key_windows.end(),
					 [win](const KeyWindow &w) { return w.win == win; }),
			  key_windows.end());
	for (KeyRegistration *registration : key_registrations) {
		if (registration->win == win)
			registration->win = nullptr;
	}
}

void on_registered_object_del(void *data, Evas *, Evas_Object *, void *);

void registration_remove(KeyRegistration *registration)
{
	key_registrations.erase(std::find(key_registrations.begin(), key_registrations.end(), registration));
	evas_object_event_callback_del_full(registration->obj, EVAS_CALLBACK_DEL, on_registered_object_del, registration);
	if (registration->win)
		window_detach(registration->win);
	delete registration;
}

void on_registered_object_del(void *data, Evas *, Evas_Object *, void *)
{
	registration_remove(static_cast<KeyRegistration *>(data));
}

bool is_shown(const Evas_Object *obj)
{
	for (const Evas_Object *o = obj; o; o = evas_object_smart_parent_get(o)) {
		if (!evas_object_visible_get(o))
			return false;
	}
	return true;
}

bool key_is(const char *keyname, const char *const (&keys)[2])
{
	return keyname && (strcmp(keyname, keys[0]) == 0 || strcmp(keyname, keys[1]) == 0);
}

void on_window_key_down(void *, Evas *, Evas_Object *win, void *event_info)
{
	auto *event = static_cast<Evas_Event_Key_Down *>(event_info);
	if (!event || (event->event_flags & EVAS_EVENT_FLAG_ON_HOLD))
		return;
	Assist_Key type;
	if (key_is(event->keyname, back_keys))
		type = EA_CALLBACK_BACK;
	else if (key_is(event->keyname, more_keys))
		type = EA_CALLBACK_MORE;
	else
		return;

	for (auto it = key_registrations.rbegin(); it != key_registrations.rend(); ++it) {
		const KeyRegistration *registration = *it;
		if (registration->win != win || registration->type != type || !is_shown(registration->obj))
			continue;
		// Copied first: the callback may add or remove registrations,
		// including this one.
		Assist_Key_Cb func = registration->func;
		void *data = registration->data;
		Evas_Object *obj = registration->obj;
		event->event_flags = static_cast<Evas_Event_Flags>(event->event_flags | EVAS_EVENT_FLAG_ON_HOLD);
		func(data, obj, nullptr);
		return;
	}
}

/* ---- Theme change callbacks ------------------------------------------ */

struct ThemeCallback {
	unsigned long serial;
	Assist_Theme_Event type;
	Assist_Theme_Cb func;
	void *data;
};

std::vector<ThemeCallback> theme_callbacks;
unsigned long theme_callback_serial;

} // namespace

/* ---- Exported: tables ------------------------------------------------ */

extern "C" Assist_Colour_Table *ea_theme_color_table_new(const char *file)
{
	ParseState state;
	if (!parse_table(file, "ColorTable", &state))
		return nullptr;
	auto *table = new _Assist_Colour_Table();
	table->colors = std::make_shared<const ColorMap>(std::move(state.colors));
	return table;
}

extern "C" void ea_theme_color_table_free(Assist_Colour_Table *table)
{
	delete table;
}

extern "C" Assist_Font_Table *ea_theme_font_table_new(const char *file)
{
	ParseState state;
	if (!parse_table(file, "FontTable", &state))
		return nullptr;
	auto *table = new _Assist_Font_Table();
	table->fonts = std::make_shared<const FontMap>(std::move(state.fonts));
	return table;
}

extern "C" void ea_theme_font_table_free(Assist_Font_Table *table)
{
	delete table;
}

/* ---- Exported: object styles and tables ------------------------------ */

extern "C" void ea_theme_object_changeable_ui_enabled_set(Evas_Object *obj, Eina_Bool enabled)
{
	if (obj)
		object_theme_get(obj)->changeable = enabled;
}

extern "C" Eina_Bool ea_theme_object_changeable_ui_enabled_get(const Evas_Object *obj)
{
	const ObjectTheme *theme = obj ? object_theme_find(obj) : nullptr;
	return theme && theme->changeable;
}

extern "C" Eina_Bool ea_theme_object_style_set(Evas_Object *obj, Assist_Style style)
{
	if (!obj || !valid_style(style))
		return EINA_FALSE;
	object_theme_get(obj)->style = style;
	return EINA_TRUE;
}

extern "C" Assist_Style ea_theme_object_style_get(const Evas_Object *obj)
{
	const ObjectTheme *theme = obj ? object_theme_find(obj) : nullptr;
	return theme ? theme->style : ASSIST_STYLE_DEFAULT;
}

extern "C" Eina_Bool ea_theme_object_colors_set(Evas_Object *obj, Assist_Colour_Table *table, Assist_Style style)
{
	if (!obj || !table || !valid_style(style))
		return EINA_FALSE;
	object_theme_get(obj)->colors = table->colors;
	if (Evas_Object *edje = edje_of(obj)) {
		for (const auto &[code, entry] : *table->colors) {
			edje_object_color_class_set(edje, code.c_str(),
						    entry.color[0], entry.color[1], entry.color[2], entry.color[3],
						    entry.outline[0], entry.outline[1], entry.outline[2], entry.outline[3],
						    entry.shadow[0], entry.shadow[1], entry.shadow[2], entry.shadow[3]);
		}
	}
	return EINA_TRUE;
}

extern "C" Eina_Bool ea_theme_object_fonts_set(Evas_Object *obj, Assist_Font_Table *table)
{
	if (!obj || !table)
		return EINA_FALSE;
	object_theme_get(obj)->fonts = table->fonts;
	if (Evas_Object *edje = edje_of(obj)) {
		for (const auto &[code, entry] : *table->fonts)
			edje_object_text_class_set(edje, code.c_str(), entry.font.c_str(), entry.size);
	}
	return EINA_TRUE;
}

extern "C" Eina_Bool ea_theme_object_color_get(Evas_Object *obj, const char *code,
					      int *r, int *g, int *b, int *a,
					      int *r2, int *g2, int *b2, int *a2,
					      int *r3, int *g3, int *b3, int *a3)
{
	const ColorMap *colors = (obj && code) ? nearest_colors(obj) : nullptr;
	const ColorEntry *entry = nullptr;
	if (colors) {
		auto it = colors->find(code);
		if (it != colors->end())
			entry = &it->second;
	}
	// An unknown code reads as transparent, so a caller that does not
	// check the result never paints with uninitialised values.
	static const ColorEntry none;
	const ColorEntry &found = entry ? *entry : none;
	int *out[3][4] = {{r, g, b, a}, {r2, g2, b2, a2}, {r3, g3, b3, a3}};
	const Rgba *in[3] = {&found.color, &found.outline, &found.shadow};
	for (int layer = 0; layer < 3; layer++) {
		for (int channel = 0; channel < 4; channel++) {
			if (out[layer][channel])
				*out[layer][channel] = (*in[layer])[channel];
		}
	}
	return entry ? EINA_TRUE : EINA_FALSE;
}

extern "C" Eina_Bool ea_theme_object_item_color_replace(Elm_Object_Item *item, const char *color_class, const char *code)
{
	if (!item || !color_class || !*color_class || !code)
		return EINA_FALSE;
	ColorEntry entry;
	if (strcmp(code, "transparent") != 0) {
		Evas_Object *widget = elm_object_item_widget_get(item);
		const ColorMap *colors = widget ? nearest_colors(widget) : nullptr;
		auto it = colors ? colors->find(code) : ColorMap::const_iterator();
		if (!colors || it == colors->end())
			return EINA_FALSE;
		entry = it->second;
	}
	// An item's parts live in the Edje object that holds its content.
	Evas_Object *edje = elm_object_item_part_content_get(item, nullptr);
	while (edje && !is_edje(edje))
		edje = evas_object_smart_parent_get(edje);
	if (!edje)
		return EINA_FALSE;
	return edje_object_color_class_set(edje, color_class,
					   entry.color[0], entry.color[1], entry.color[2], entry.color[3],
					   entry.outline[0], entry.outline[1], entry.outline[2], entry.outline[3],
					   entry.shadow[0], entry.shadow[1], entry.shadow[2], entry.shadow[3]);
}

/* ---- Exported: hardware keys ----------------------------------------- */

extern "C" void ea_object_event_callback_add(Evas_Object *obj, Assist_Key type, Assist_Key_Cb func, void *data)
{
	if (!obj || !func || type < EA_CALLBACK_BACK || type >= ASSIST_KEY_COUNT)
		return;
	auto *registration = new KeyRegistration{obj, elm_win_get(obj), type, func, data};
	key_registrations.push_back(registration);
	evas_object_event_callback_add(obj, EVAS_CALLBACK_DEL, on_registered_object_del, registration);
	if (registration->win)
		window_attach(registration->win);
}

extern "C" void *ea_object_event_callback_del(Evas_Object *obj, Assist_Key type, Assist_Key_Cb func)
{
	for (auto it = key_registrations.rbegin(); it != key_registrations.rend(); ++it) {
		KeyRegistration *registration = *it;
		if (registration->obj == obj && registration->type == type && registration->func == func) {
			void *data = registration->data;
			registration_remove(registration);
			return data;
		}
	}
	return nullptr;
}

/* ---- Exported: theme change callbacks -------------------------------- */

extern "C" void ea_theme_event_callback_add(Assist_Theme_Event type, Assist_Theme_Cb func, void *data)
{
	if (!func)
		return;
	theme_callbacks.push_back({++theme_callback_serial, type, func, data});
}

extern "C" void *ea_theme_event_callback_del(Assist_Theme_Event type, Assist_Theme_Cb func)
{
	auto it = std::find_if(theme_callbacks.begin(), theme_callbacks.end(),
			       [&](const ThemeCallback &c) { return c.type == type && c.func == func; });
	if (it == theme_callbacks.end())
		return nullptr;
	void *data = it->data;
	theme_callbacks.erase(it);
	return data;
}

extern "C" void ea_theme_changed_notify(Assist_Theme_Event type)
{
	// Callbacks may remove themselves or others while we go: work on a
	// snapshot and skip any that are gone by the time their turn comes.
	const std::vector<ThemeCallback> snapshot = theme_callbacks;
	for (const ThemeCallback &callback : snapshot) {
		if (callback.type != type)
			continue;
		bool still_registered = std::any_of(theme_callbacks.begin(), theme_callbacks.end(),
						    [&](const ThemeCallback &c) { return c.serial == callback.serial; });
		if (still_registered)
			callback.func(callback.data);
	}
}
