/* The picture file as the loader takes it: opened without blocking, refused
 * unless it is a regular file, handed to Evas as the file that was checked
 * (never by its name again), and looked over before any decoding for what
 * the decoder hides: a JPEG or PNG cut short, and the EXIF orientation
 * wherever its block sits. Internal to ie-image. */
#ifndef IE_IMAGE_SOURCE_H
#define IE_IMAGE_SOURCE_H

#include <Eina.h>

#include <cstddef>
#include <cstdint>

struct Ie_Image_Source {
	/* The file for evas_object_image_mmap_set; Evas keeps its own
	 * references, so it may be closed once the images have it. */
	Eina_File *file;
	/* EXIF orientation, 1 to 8; 1 when the file has none. */
	int orientation;
};

struct Ie_Image_Facts {
	/* False for a JPEG whose data ends before its end-of-image marker and
	 * a PNG whose chunks end before IEND. Other formats are left to the
	 * decoder. */
	bool complete;
	int orientation;
};

/* Opens `path` into `source`. A path that cannot be read, is not a regular
 * file or holds a damaged picture logs one line and gives false. */
bool ie_image_source_open(const char *path, Ie_Image_Source *source);
void ie_image_source_close(Ie_Image_Source *source);

/* What the bytes of a picture file say before decoding. */
Ie_Image_Facts ie_image_facts_get(const uint8_t *data, size_t size);

#endif
