/* Saving the edited picture as a new JPEG beside the source. */
#ifndef IE_SAVE_H
#define IE_SAVE_H

#include <sys/statvfs.h>
#include <Evas.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Chooses the first free name "<source name>_eNNN.jpg" beside `filepath`. */
void _save_init(const char *filepath);
/* The path chosen by the last _save_init ("" when none was found). */
const char *ie_save_path_get(void);
/* EINA_TRUE when the storage of the save path has room for a picture. */
Eina_Bool get_internal_memory_status(struct statvfs *st);
/* Writes the pixels of `img` (laid on white when it has alpha), with the
 * source photograph's metadata, as a new file under the save path, or
 * under the next free name when that one was taken meanwhile. Returns a
 * calloc'ed copy of the path written, or NULL; sets *memory_full when the
 * storage was too full, before or while writing. A failure is logged once,
 * with its cause. The file is not yet registered: see ie_save_register. */
char *_save_to_file(Evas_Object *img, Eina_Bool *memory_full);

/* Registration of a saved file with the media database, off the main loop:
 * the database may be held by another process for seconds. */
typedef struct _Ie_Save_Registration Ie_Save_Registration;
/* Runs on the main loop once the row is written or has definitely failed
 * (logged); `path` is handed back to the callee. */
typedef void (*Ie_Save_Registered_Cb)(void *data, char *path);
/* Takes over `path` (calloc'ed); `done` never runs before this returns.
 * NULL, with `path` left to the caller, only when memory runs out. */
Ie_Save_Registration *ie_save_register(char *path, Ie_Save_Registered_Cb done, void *data);
/* `done` will not run; the row may still be written. */
void ie_save_register_abandon(Ie_Save_Registration *registration);

#ifdef __cplusplus
}
#endif

#endif
