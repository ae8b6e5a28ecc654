/* efl-assist: theme colour and font tables, changeable-UI styles, and the
 * hardware Back and More keys delivered as object callbacks. */
#ifndef ASSIST_THEME_H
#define ASSIST_THEME_H

#include <Elementary.h>

#ifdef __cplusplus
extern "C" {
#endif

#define ASSIST_API __attribute__((visibility("default")))

/* Hardware keys. A Back key press (Escape or XF86Back on the window) goes to
 * the most recently added EA_CALLBACK_BACK callback whose object is still
 * alive and shown; More (Menu or XF86Menu) likewise. */
typedef enum {
	EA_CALLBACK_BACK = 0,
	EA_CALLBACK_MORE,
	ASSIST_KEY_COUNT
} Assist_Key;

typedef void (*Assist_Key_Cb)(void *data, Evas_Object *obj, void *event_info);

ASSIST_API void ea_object_event_callback_add(Evas_Object *obj, Assist_Key type, Assist_Key_Cb func, void *data);
/* Removes the callback and returns its data, or NULL when none matched. */
ASSIST_API void *ea_object_event_callback_del(Evas_Object *obj, Assist_Key type, Assist_Key_Cb func);

/* Theme styles of changeable UI. */
typedef enum {
	ASSIST_STYLE_DEFAULT = 0,
	ASSIST_STYLE_LIGHT = 1,
	ASSIST_STYLE_DARK = 2
} Assist_Style;

typedef struct _Assist_Colour_Table Assist_Colour_Table;
typedef struct _Assist_Font_Table Assist_Font_Table;

/* Tables parsed from the XML files of the application; NULL when the file
 * is missing or malformed. */
ASSIST_API Assist_Colour_Table *ea_theme_color_table_new(const char *file);
ASSIST_API void ea_theme_color_table_free(Assist_Colour_Table *table);
ASSIST_API Assist_Font_Table *ea_theme_font_table_new(const char *file);
ASSIST_API void ea_theme_font_table_free(Assist_Font_Table *table);

ASSIST_API void ea_theme_object_changeable_ui_enabled_set(Evas_Object *obj, Eina_Bool enabled);
ASSIST_API Eina_Bool ea_theme_object_changeable_ui_enabled_get(const Evas_Object *obj);
ASSIST_API Eina_Bool ea_theme_object_style_set(Evas_Object *obj, Assist_Style style);
ASSIST_API Assist_Style ea_theme_object_style_get(const Evas_Object *obj);
/* Applies a colour table to the object's colour classes (and remembers it
 * for ea_theme_object_color_get); a font table to its text classes. The
 * object keeps its own copy: the table may be freed before the object. */
ASSIST_API Eina_Bool ea_theme_object_colors_set(Evas_Object *obj, Assist_Colour_Table *table, Assist_Style style);
ASSIST_API Eina_Bool ea_theme_object_fonts_set(Evas_Object *obj, Assist_Font_Table *table);

/* Colour of a colour code as seen from `obj` (the nearest table applied to
 * it or one of its parents): the main, outline and shadow colours. Any
 * pointer may be NULL. EINA_FALSE when the code is unknown; the colours
 * given back are then all 0. */
ASSIST_API Eina_Bool ea_theme_object_color_get(Evas_Object *obj, const char *code,
					   int *r, int *g, int *b, int *a,
					   int *r2, int *g2, int *b2, int *a2,
					   int *r3, int *g3, int *b3, int *a3);
/* Makes the item's colour class `color_class` take the colour code `code`
 * ("transparent" for none), on the Edje object that holds the item's
 * content. EINA_FALSE for an unknown code or an item without content. */
ASSIST_API Eina_Bool ea_theme_object_item_color_replace(Elm_Object_Item *item, const char *color_class, const char *code);

/* Theme change notifications. */
typedef enum {
	ASSIST_THEME_EVENT_COLOUR = 0,
	ASSIST_THEME_EVENT_FONT = 1
} Assist_Theme_Event;

typedef void (*Assist_Theme_Cb)(void *data);

ASSIST_API void ea_theme_event_callback_add(Assist_Theme_Event type, Assist_Theme_Cb func, void *data);
/* Removes the first matching callback and returns its data, or NULL. */
ASSIST_API void *ea_theme_event_callback_del(Assist_Theme_Event type, Assist_Theme_Cb func);
/* Announces a theme change to every registered callback of `type`. */
ASSIST_API void ea_theme_changed_notify(Assist_Theme_Event type);

#ifdef __cplusplus
}
#endif

#endif
