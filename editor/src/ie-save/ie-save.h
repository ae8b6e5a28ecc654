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
/* Writes the pixels of `img` to the save path and registers the file.
 * Returns a calloc'ed copy of the path, or NULL; sets *memory_full only
 * when the storage is too full. */
char *_save_to_file(Evas_Object *img, Eina_Bool *memory_full);

#ifdef __cplusplus
}
#endif

#endif
