/* Image engine records, shared with the effect libraries: the image record,
 * its pixel formats, the result codes and the effect parameter block. */
#ifndef IEL_TYPES_H
#define IEL_TYPES_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

enum {
	IEL_FORMAT_RGB565 = 1,   /* 2 bytes per pixel */
	IEL_FORMAT_RGB888 = 2,   /* R, G, B */
	IEL_FORMAT_BGRA8888 = 3, /* B, G, R, A: the canvas's ARGB32 word */
	IEL_FORMAT_ARGB8888 = 4  /* A, R, G, B: code 3 with each pixel's bytes reversed */
};

enum {
	IEL_OK = 0,
	IEL_ERR_INVALID_PARAM = 1,
	IEL_ERR_ALLOC = 2,
	IEL_ERR_INVALID_SIZE = 3,
	IEL_ERR_UNSUPPORTED_FORMAT = 4,
	IEL_ERR_FILE = 8,
	IEL_ERR_NO_MEMORY = 9
};

/* A picture described for one call; the engine never allocates or frees
 * pbBuf. Rows are packed: stride = u32Width * bytes per pixel. */
typedef struct {
	uint32_t u32Width;
	uint32_t u32Height;
	int16_t eFormat;
	uint8_t *pbBuf;
} IEL_Image;

/* Parameter block of IEL_Apply_Effect. On the 32-bit target it is 24 bytes:
 * id at 0, option pointer at 4, texture pointer at 8, three zero words. */
typedef struct {
	uint16_t u16EffectId;
	uint16_t u16Reserved;
	int32_t *ps32Option;
	IEL_Image *pstTexture;
	uint32_t au32Reserved[3];
} IEL_EffectParam;

#ifdef __cplusplus
}
#endif

#endif
