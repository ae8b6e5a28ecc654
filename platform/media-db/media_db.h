/* Media content: the platform's media database. A scan records a media
 * file's canonical path, MIME type, size, pixel size, modification time
 * and, for a photograph, the date it was taken, in a SQLite database
 * ($MEDIA_DB_PATH, default /var/lib/editor-svc-platform/media.db). While
 * another process writes to it, a call waits up to
 * $MEDIA_DB_BUSY_TIMEOUT_MS milliseconds (default 5000), then gives
 * MEDIA_DB_ERROR_DB_BUSY. */
#ifndef MEDIA_DB_H
#define MEDIA_DB_H

#include <stddef.h>
#include <platform_error.h>

#ifdef __cplusplus
extern "C" {
#endif

#define MEDIA_DB_API __attribute__((visibility("default")))

typedef enum {
	MEDIA_DB_ERROR_NONE = PLATFORM_ERROR_NONE,
	MEDIA_DB_ERROR_INVALID_PARAMETER = PLATFORM_ERROR_INVALID_PARAMETER,
	MEDIA_DB_ERROR_OUT_OF_MEMORY = PLATFORM_ERROR_OUT_OF_MEMORY,
	MEDIA_DB_ERROR_INVALID_OPERATION = PLATFORM_ERROR_BLOCK(5) - 1,
	MEDIA_DB_ERROR_NO_SPACE = PLATFORM_ERROR_BLOCK(5) - 2,
	MEDIA_DB_ERROR_PERMISSION_DENIED = PLATFORM_ERROR_PERMISSION_DENIED,
	MEDIA_DB_ERROR_DB_FAILED = PLATFORM_ERROR_BLOCK(5) - 3,
	MEDIA_DB_ERROR_DB_BUSY = PLATFORM_ERROR_BLOCK(5) - 4,
	MEDIA_DB_ERROR_NOT_SUPPORTED = PLATFORM_ERROR_NOT_SUPPORTED
} Media_Db_Error;

MEDIA_DB_API int media_db_open(void);
MEDIA_DB_API int media_db_close(void);
/* Inserts or updates the file's row, keyed by its canonical absolute path
 * (links, "." and ".." resolved); the MIME type, pixel size and date taken
 * come from the file's content, not its name. A missing file, a directory, or a
 * file that is not a picture, video or sound (or whose picture header is
 * cut short) gives MEDIA_DB_ERROR_INVALID_PARAMETER and no row. Works
 * with or without a prior media_db_open(). */
MEDIA_DB_API int media_content_scan_file(const char *path);

/* One row of the database, as read back by media_db_lookup. */
typedef struct {
	char mime_type[64];
	long long size;
	int width;
	int height;
	long long modified_time;
	/* When the picture was taken (EXIF DateTimeOriginal), as
	 * "YYYY-MM-DD HH:MM:SS", so that it sorts as text; "" when unknown. */
	char date_taken[20];
} Media_Db_Row;

/* Reads the row of `path` (canonicalised as by a scan): MEDIA_DB_ERROR_NONE
 * and the record, or
 * MEDIA_DB_ERROR_INVALID_OPERATION when there is none. */
MEDIA_DB_API int media_db_lookup(const char *path, Media_Db_Row *record);

#ifdef __cplusplus
}
#endif

#endif
