/* The main image object's record, shared by the object (ie-image.cpp) and
 * the picture loading (ie-image-load.cpp). Internal to ie-image. */
#ifndef IE_IMAGE_PRIVATE_H
#define IE_IMAGE_PRIVATE_H

#include <Ecore.h>
#include <Evas.h>

#include "ie-image.h"

typedef struct {
	Evas_Object *obj;
	Evas_Object *image;
	Evas_Object *gesture;
	Evas_Object *preload_image;
	Eina_Bool visible;
	Eina_Bool loaded;
	Eina_Bool fitted;
	char *path;
	int mode;
	Evas_Coord x, y, w, h;
	double scale;
	int img_w, img_h;
	Evas_Object *processing_popup;
	Eina_Bool preloaded;
	Evas_Object *parent;
	int last_x, last_y;
	/* Set while evas_object_image_preload runs: a completion reported from
	 * inside that call must not drop the file under it. */
	Eina_Bool preload_starting;
	/* The background load reported a decoding failure from inside that
	 * call. */
	Eina_Bool preload_failed;
	/* Reports a failed background load once the preload notice is over:
	 * the owner may delete the object, and with it the offscreen canvas
	 * that is still delivering that notice. */
	Ecore_Job *load_failed_job;
	/* EXIF orientation of the picture being loaded in the background; its
	 * pixels are turned upright as they arrive. */
	int orientation;
	/* Pixels handed over with ie_image_pixels_take: Evas shows them but
	 * never frees them, so the main image does, once the picture shows
	 * other pixels. */
	void *own_pixels;
	/* A JPEG or PNG decoded by our own decoder on a worker thread: the
	 * thread and its job, until the result is put in place or dropped. */
	Ecore_Thread *decode_thread;
	struct Decode_Job *decode_job;
} Mainimg_Smart_Data;

/* The record of a main image object, or NULL for any other object. */
Mainimg_Smart_Data *_mainimg_data_get(const Evas_Object *obj);

/* Takes down the processing popup, if one is up. */
void _processing_popup_del(Mainimg_Smart_Data *sd);

/* Drops the offscreen canvas of an asynchronous load and its image, or the
 * worker's decoding; any completion or failure report still pending is
 * cancelled with them. */
void _preload_release(Mainimg_Smart_Data *sd);

/* Frees the main image's own pixels unless the picture still shows them
 * (always, once the inner image is gone). */
void _own_pixels_release_unshown(Mainimg_Smart_Data *sd);

#endif
