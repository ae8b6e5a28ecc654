/* The main image object ("ie-mainimg"): shows the picture fitted to its
 * area, zooms it with a pinch or a double tap, pans it, and gives the views
 * access to its pixels (BGRA, stride = width * 4). */
#ifndef IE_IMAGE_H
#define IE_IMAGE_H

#include <Evas.h>

#ifdef __cplusplus
extern "C" {
#endif

enum {
	IE_IMAGE_MODE_PASSIVE = 0,
	IE_IMAGE_MODE_NORMAL = 1,
	IE_IMAGE_MODE_CROP = 2,
	IE_IMAGE_MODE_ACTIVE = 3
};

/* Smart callback of the main image when a background load, already
 * reported as started, cannot decode the picture after all. The picture
 * stays empty; the owner may delete the object from the callback. */
#define IE_IMAGE_SIGNAL_LOAD_FAILED "load,failed"

Evas_Object *ie_image_add(Evas_Object *parent);
Eina_Bool ie_image_file_load(Evas_Object *obj, const char *path, int width, int height);
void *ie_image_data_get(Evas_Object *obj);
/* Shows `pixels` (w x h, rows packed, from malloc) as the picture without
 * copying them: the main image owns them from then on, also when it
 * fails (the picture is then left empty), and frees them once the picture
 * shows other pixels. `pixels` may be the main image's own buffer,
 * reworked in place. */
Eina_Bool ie_image_pixels_take(Evas_Object *obj, void *pixels, int w, int h);
/* A w x h buffer of the main image's own, shown as the picture, for the
 * caller to write every pixel of and then mark with
 * evas_object_image_data_update_add: the one the picture shows if it has
 * that size, else a new one (not cleared) that replaces the picture. NULL
 * when none can be had; the picture is then empty. */
void *ie_image_own_pixels_get(Evas_Object *obj, int w, int h);
/* Whether `pixels`, as ie_image_data_get gave them, are the buffer the
 * main image owns: a caller may then rework them in place and hand them
 * back with ie_image_pixels_take. */
Eina_Bool ie_image_pixels_owned(Evas_Object *obj, const void *pixels);
Evas_Object *ie_image_object_get(Evas_Object *obj);
void ie_image_geometry_get(Evas_Object *obj, Evas_Coord *x, Evas_Coord *y, Evas_Coord *w, Evas_Coord *h);
void ie_image_zoom_enabled_set(Evas_Object *obj, Eina_Bool enable);
void ie_image_double_tap_enabled_set(Eina_Bool enable, Evas_Object *obj);
void ie_image_mode_set(Evas_Object *obj, int mode);
void ie_image_refit(Evas_Object *obj);
void ie_image_size_update(Evas_Object *obj);

#ifdef __cplusplus
}
#endif

#endif
