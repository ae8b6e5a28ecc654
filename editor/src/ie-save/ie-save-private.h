/* Internals of the save module that its tests reach. */
#ifndef IE_SAVE_PRIVATE_H
#define IE_SAVE_PRIVATE_H

#include <sys/statvfs.h>
#include <time.h>
#include <Eina.h>

/* Storage measured directly when the save path lies below it. */
#define IE_SAVE_SDCARD_ROOT "/opt/storage/sdcard"
/* A full-size JPEG needs about this much room. */
#define IE_SAVE_MIN_FREE_BYTES 1242880ULL
/* A private directory of this name plus 12 letters or digits: made by a
 * save in the destination folder where unnamed files cannot be, and once
 * per process in the runtime directory to reach those files by name. */
#define IE_SAVE_WORK_DIR_PREFIX ".ie-save-"

#ifdef __cplusplus
extern "C" {
#endif

/* EINA_TRUE when `st` reports at least IE_SAVE_MIN_FREE_BYTES available. */
Eina_Bool ie_save_free_space_enough(const struct statvfs *st);
/* Whether saves write unnamed files where the file system has them (the
 * default); without, they write in a private directory, as on file systems
 * that have none. */
void ie_save_unnamed_files_set(Eina_Bool enabled);

#ifdef __cplusplus
}

#include <string>

/* The marker segments to follow the start (and JFIF header) of a JPEG
 * saved from `source`: the source's EXIF block brought up to date for a
 * picture of `width` x `height` written at `now`, and its colour profile,
 * byte for byte. Empty for a source without them, or not a JPEG. */
std::string ie_save_metadata_segments(const char *source, int width, int height, time_t now);
#endif

#endif
