/* Internals of the save module that its tests reach. */
#ifndef IE_SAVE_PRIVATE_H
#define IE_SAVE_PRIVATE_H

#include <sys/statvfs.h>
#include <Eina.h>

/* Storage measured directly when the save path lies below it. */
#define IE_SAVE_SDCARD_ROOT "/opt/storage/sdcard"
/* A full-size JPEG needs about this much room. */
#define IE_SAVE_MIN_FREE_BYTES 1242880ULL
/* A save works in a private directory of this name plus 12 letters or
 * digits, made in the destination folder and removed afterwards. */
#define IE_SAVE_WORK_DIR_PREFIX ".ie-save-"

#ifdef __cplusplus
extern "C" {
#endif

/* EINA_TRUE when `st` reports at least IE_SAVE_MIN_FREE_BYTES available. */
Eina_Bool ie_save_free_space_enough(const struct statvfs *st);

#ifdef __cplusplus
}
#endif

#endif
