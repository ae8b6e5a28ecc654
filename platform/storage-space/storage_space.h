/* Storage: size of the device's storages. The internal storage is the
 * file system holding $STORAGE_INTERNAL_ROOT (default /home). */
#ifndef STORAGE_SPACE_H
#define STORAGE_SPACE_H

#include <sys/statvfs.h>
#include <platform_error.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef enum {
	STORAGE_SPACE_ERROR_NONE = PLATFORM_ERROR_NONE,
	STORAGE_SPACE_ERROR_INVALID_PARAMETER = PLATFORM_ERROR_INVALID_PARAMETER,
	STORAGE_SPACE_ERROR_OUT_OF_MEMORY = PLATFORM_ERROR_OUT_OF_MEMORY,
	STORAGE_SPACE_ERROR_NOT_SUPPORTED = PLATFORM_ERROR_NOT_SUPPORTED,
	STORAGE_SPACE_ERROR_OPERATION_FAILED = PLATFORM_ERROR_BLOCK(4) - 1
} Storage_Space_Error;

/* The internal storage root in use (the environment override or the
 * platform default). */
__attribute__((visibility("default"))) const char *storage_get_internal_root(void);
/* statvfs of the internal storage root. */
__attribute__((visibility("default"))) int storage_get_internal_memory_size(struct statvfs *buf);

#ifdef __cplusplus
}
#endif

#endif
