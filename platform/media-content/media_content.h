/* Media content: the platform's media database. A scan records a media
 * file's path, MIME type, size, pixel size and modification time in a
 * SQLite database ($MEDIA_CONTENT_DB, default /opt/usr/dbspace/.media.db). */
#ifndef MEDIA_CONTENT_H
#define MEDIA_CONTENT_H

#include <stddef.h>
#include <tizen_error.h>

#ifdef __cplusplus
extern "C" {
#endif

#define MEDIA_CONTENT_API __attribute__((visibility("default")))

typedef enum {
	MEDIA_CONTENT_ERROR_NONE = TIZEN_ERROR_NONE,
	MEDIA_CONTENT_ERROR_INVALID_PARAMETER = TIZEN_ERROR_INVALID_PARAMETER,
	MEDIA_CONTENT_ERROR_OUT_OF_MEMORY = TIZEN_ERROR_OUT_OF_MEMORY,
	MEDIA_CONTENT_ERROR_INVALID_OPERATION = TIZEN_ERROR_CONTENT | 0x01,
	MEDIA_CONTENT_FILE_NO_SPACE_ON_DEVICE = TIZEN_ERROR_CONTENT | 0x02,
	MEDIA_CONTENT_ERROR_PERMISSION_DENIED = TIZEN_ERROR_PERMISSION_DENIED,
	MEDIA_CONTENT_ERROR_DB_FAILED = TIZEN_ERROR_CONTENT | 0x31,
	MEDIA_CONTENT_ERROR_DB_BUSY = TIZEN_ERROR_CONTENT | 0x32,
	MEDIA_CONTENT_ERROR_NOT_SUPPORTED = TIZEN_ERROR_NOT_SUPPORTED
} media_content_error_e;

MEDIA_CONTENT_API int media_content_connect(void);
MEDIA_CONTENT_API int media_content_disconnect(void);
/* Inserts or updates the file's row; the MIME type and pixel size come
 * from the file's content, not its name. A missing file, a directory, or a
 * file that is not a picture, video or sound (or whose picture header is
 * cut short) gives MEDIA_CONTENT_ERROR_INVALID_PARAMETER and no row. Works
 * with or without a prior media_content_connect(). */
MEDIA_CONTENT_API int media_content_scan_file(const char *path);

/* One row of the database, as read back by media_content_lookup. */
typedef struct {
	char mime_type[64];
	long long size;
	int width;
	int height;
	long long modified_time;
} media_content_record_s;

/* Reads the row of `path`: MEDIA_CONTENT_ERROR_NONE and the record, or
 * MEDIA_CONTENT_ERROR_INVALID_OPERATION when there is none. */
MEDIA_CONTENT_API int media_content_lookup(const char *path, media_content_record_s *record);

#ifdef __cplusplus
}
#endif

#endif
