/* In-place picture editor for a photo viewer.
 *
 * Host contract: IE_create(parent), IE_setparam(vh, path, w, h, rotation)
 * once, embed IE_get_view_object(vh) and listen for the smart callback
 * "delete,me" on it. Its event_info is NULL when nothing was saved, or the
 * new file's path (allocated with calloc, owned by the host from then on).
 * Then call IE_destroy(vh). */
#ifndef EDITOR_SVC_H
#define EDITOR_SVC_H

#include <Evas.h>
#include <Eina.h>

#ifdef __cplusplus
extern "C" {
#endif

#define IE_API __attribute__((visibility("default")))

typedef struct _Viewhandle Viewhandle;

enum {
	IE_VIEW_TYPE_UNDEF = 0,
	IE_VIEW_TYPE_MAIN = 1,
	IE_VIEW_TYPE_EFFECT = 2,
	IE_VIEW_TYPE_CROP = 3,
	IE_VIEW_TYPE_ROTATE_LEFT = 4,
	IE_VIEW_TYPE_ROTATE_RIGHT = 5,
	IE_VIEW_TYPE_SAVE = 6
};

IE_API Viewhandle *IE_create(Evas_Object *parent);
IE_API void IE_setparam(Viewhandle *vh, const char *path, int width, int height, int rotation);
IE_API Evas_Object *IE_get_view_object(Viewhandle *vh);
IE_API void IE_destroy(Viewhandle *vh);
IE_API void IE_pause(Viewhandle *vh);
IE_API void IE_resume(Viewhandle *vh);

IE_API Eina_Bool ie_view_mgr_set_view(int view, Viewhandle *vh);
IE_API int ie_view_mgr_get_current_view(void);

IE_API void ie_set_main_view_text(Viewhandle *vh);
IE_API void ie_create_crop_view(Viewhandle *vh);
IE_API void ie_delete_crop_view(Viewhandle *vh);
IE_API void ie_create_rotate_view(Viewhandle *vh, int direction);
IE_API void ie_create_effect_view(Viewhandle *vh);
IE_API void ie_delete_effect_view(Viewhandle *vh);

#ifdef __cplusplus
}
#endif

#endif
