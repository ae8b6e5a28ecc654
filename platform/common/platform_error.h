/* Result codes shared by the platform stand-ins. 0 is success and every
 * failure is negative. The generic failures below mean the same in every
 * service; a service's own failures take codes from its block of 256
 * (PLATFORM_ERROR_BLOCK), so that no two services share a value. */
#ifndef PLATFORM_ERROR_H
#define PLATFORM_ERROR_H

#define PLATFORM_ERROR_NONE 0
#define PLATFORM_ERROR_INVALID_PARAMETER (-1)
#define PLATFORM_ERROR_OUT_OF_MEMORY (-2)
#define PLATFORM_ERROR_PERMISSION_DENIED (-3)
#define PLATFORM_ERROR_NOT_SUPPORTED (-4)
#define PLATFORM_ERROR_KEY_NOT_FOUND (-5)
#define PLATFORM_ERROR_IO (-6)

/* Service blocks: the log 1, bundles 2, app launch 3, storage 4, media
 * database 5, usage log 6. */
#define PLATFORM_ERROR_BLOCK(service) (-256 * (service))

#endif
