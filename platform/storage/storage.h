/* Storage: size of the device's storages. The internal storage is the
 * file system holding $STORAGE_INTERNAL_ROOT (default /opt/usr/media). */
#ifndef STORAGE_H
#define STORAGE_H

#include <sys/statvfs.h>
#include <tizen_error.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef enum {
	STORAGE_ERROR_NONE = TIZEN_ERROR_NONE,
	STORAGE_ERROR_INVALID_PARAMETER = TIZEN_ERROR_INVALID_PARAMETER,
	STORAGE_ERROR_OUT_OF_MEMORY = TIZEN_ERROR_OUT_OF_MEMORY,
	STORAGE_ERROR_NOT_SUPPORTED = TIZEN_ERROR_NOT_SUPPORTED,
	STORAGE_ERROR_OPERATION_FAILED = TIZEN_ERROR_STORAGE | 0x12
} storage_error_e;

/* The internal storage root in use (the environment override or the
 * platform default). */
__attribute__((visibility("default"))) const char *storage_get_internal_root(void);
/* statvfs of the internal storage root. */
__attribute__((visibility("default"))) int storage_get_internal_memory_size(struct statvfs *buf);

#ifdef __cplusplus
}
#endif

#endif
