/* UI gadget library: the window the hosted gadget lives in. The host
 * registers its window with ug_set_window() before it creates the editor. */
#ifndef GADGET_WINDOW_H
#define GADGET_WINDOW_H

#include <Evas.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Registers the window (NULL unregisters). The registration ends by itself
 * when the window is deleted. */
__attribute__((visibility("default"))) void ug_set_window(Evas_Object *win);
/* The registered window, or NULL when the host registered none. */
__attribute__((visibility("default"))) Evas_Object *ug_get_window(void);

#ifdef __cplusplus
}
#endif

#endif
