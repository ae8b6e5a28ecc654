/* The selection box ("ie-selectbox"): the crop rectangle drawn over the
 * picture as four lines, eight handles and darkened surroundings, dragged
 * and resized by touch, kept on the picture while it is pinched, and mapped
 * onto the picture's new place after a window rotation. Coordinates are
 * canvas coordinates, the space of the picture's inner image object. */
#ifndef IE_SELECTBOX_H
#define IE_SELECTBOX_H

#include <Evas.h>

#ifdef __cplusplus
extern "C" {
#endif

/* A new, hidden box on the canvas of `parent`, without a picture. */
Evas_Object *ie_selectbox_add(Evas_Object *parent);
/* Attaches the picture's inner image object (not owned); NULL is ignored. */
void ie_selectbox_set_image(Evas_Object *obj, Evas_Object *image);
/* Places a new rectangle centred on the picture: (0, n) with n != 0 is the
 * free mode, (0, 0) fixes the current rectangle's ratio, any other pair of
 * positive terms fixes height : width = ratio_h : ratio_w. */
void ie_selectbox_set_ratio(Evas_Object *obj, int ratio_h, int ratio_w);
/* The rectangle as position and size; any pointer may be NULL. */
void ie_selectbox_get_region(Evas_Object *obj, Evas_Coord *x, Evas_Coord *y, Evas_Coord *w, Evas_Coord *h);
/* The window turned: the next calculate maps the rectangle onto the
 * picture's new geometry. */
void ie_selectbox_rotate(Evas_Object *obj);

#ifdef __cplusplus
}
#endif

#endif
