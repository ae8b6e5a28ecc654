/* efl-assist: theme colour and font tables, changeable-UI styles, and the
 * hardware Back and More keys delivered as object callbacks. */
#ifndef EFL_ASSIST_H
#define EFL_ASSIST_H

#include <Elementary.h>

#ifdef __cplusplus
extern "C" {
#endif

#define EA_API __attribute__((visibility("default")))

/* Hardware keys. A Back key press (Escape or XF86Back on the window) goes to
 * the most recently added EA_CALLBACK_BACK callback whose object is still
 * alive and shown; More (Menu or XF86Menu) likewise. */
typedef enum {
	EA_CALLBACK_BACK = 0,
	EA_CALLBACK_MORE,
	EA_CALLBACK_LAST
} Ea_Callback_Type;

typedef void (*Ea_Event_Cb)(void *data, Evas_Object *obj, void *event_info);

EA_API void ea_object_event_callback_add(Evas_Object *obj, Ea_Callback_Type type, Ea_Event_Cb func, void *data);
/* Removes the callback and returns its data, or NULL when none matched. */
EA_API void *ea_object_event_callback_del(Evas_Object *obj, Ea_Callback_Type type, Ea_Event_Cb func);

/* Theme styles of changeable UI. */
typedef enum {
	EA_THEME_STYLE_DEFAULT = 0,
	EA_THEME_STYLE_LIGHT = 1,
	EA_THEME_STYLE_DARK = 2
} Ea_Theme_Style;

typedef struct _Ea_Theme_Color_Table Ea_Theme_Color_Table;
typedef struct _Ea_Theme_Font_Table Ea_Theme_Font_Table;

/* Tables parsed from the XML files of the application; NULL when the file
 * is missing or malformed. */
EA_API Ea_Theme_Color_Table *ea_theme_color_table_new(const char *file);
EA_API void ea_theme_color_table_free(Ea_Theme_Color_Table *table);
EA_API Ea_Theme_Font_Table *ea_theme_font_table_new(const char *file);
EA_API void ea_theme_font_table_free(Ea_Theme_Font_Table *table);

EA_API void ea_theme_object_changeable_ui_enabled_set(Evas_Object *obj, Eina_Bool enabled);
EA_API Eina_Bool ea_theme_object_changeable_ui_enabled_get(const Evas_Object *obj);
EA_API Eina_Bool ea_theme_object_style_set(Evas_Object *obj, Ea_Theme_Style style);
EA_API Ea_Theme_Style ea_theme_object_style_get(const Evas_Object *obj);
/* Applies a colour table to the object's colour classes (and remembers it
 * for ea_theme_object_color_get); a font table to its text classes. The
 * object keeps its own copy: the table may be freed before the object. */
EA_API Eina_Bool ea_theme_object_colors_set(Evas_Object *obj, Ea_Theme_Color_Table *table, Ea_Theme_Style style);
EA_API Eina_Bool ea_theme_object_fonts_set(Evas_Object *obj, Ea_Theme_Font_Table *table);

/* Colour of a colour code as seen from `obj` (the nearest table applied to
 * it or one of its parents): the main, outline and shadow colours. Any
 * pointer may be NULL. EINA_FALSE when the code is unknown; the colours
 * given back are then all 0. */
EA_API Eina_Bool ea_theme_object_color_get(Evas_Object *obj, const char *code,
					   int *r, int *g, int *b, int *a,
					   int *r2, int *g2, int *b2, int *a2,
					   int *r3, int *g3, int *b3, int *a3);
/* Makes the item's colour class `color_class` take the colour code `code`
 * ("transparent" for none), on the Edje object that holds the item's
 * content. EINA_FALSE for an unknown code or an item without content. */
EA_API Eina_Bool ea_theme_object_item_color_replace(Elm_Object_Item *item, const char *color_class, const char *code);

/* Theme change notifications. */
typedef enum {
	EA_THEME_CALLBACK_TYPE_COLOR = 0,
	EA_THEME_CALLBACK_TYPE_FONT = 1
} Ea_Theme_Callback_Type;

typedef void (*Ea_Theme_Event_Cb)(void *data);

EA_API void ea_theme_event_callback_add(Ea_Theme_Callback_Type type, Ea_Theme_Event_Cb func, void *data);
/* Removes the first matching callback and returns its data, or NULL. */
EA_API void *ea_theme_event_callback_del(Ea_Theme_Callback_Type type, Ea_Theme_Event_Cb func);
/* Announces a theme change to every registered callback of `type`. */
EA_API void ea_theme_changed_notify(Ea_Theme_Callback_Type type);

#ifdef __cplusplus
}
#endif

#endif
