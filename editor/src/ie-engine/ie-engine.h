/* The editor's image engine: pixel routines on IEL_Image records. Every
 * routine returns an IEL_* result code (IEL_Bilinear_Sample returns a
 * pixel). Failures are logged with the tag "MARLUNE". */
#ifndef IE_ENGINE_H
#define IE_ENGINE_H

#include <stdint.h>

#include "IEL_Types.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Row-sum work buffer of the blur, owned by the caller and reusable. */
typedef struct {
	int32_t *ps32Buf;
	int32_t s32Size;
} IEL_RowSumBufInfo;

/* Effect codes of IEL_Run_Effect. */
enum {
	IE_EFFECT_VINTAGE = 0,
	IE_EFFECT_OLD_PHOTO = 1,
	IE_EFFECT_POP_ART = 2,
	IE_EFFECT_GREYSCALE = 3,
	IE_EFFECT_SEPIA = 4,
	IE_EFFECT_FADED_COLOURS = 5,
	IE_EFFECT_NEGATIVE = 6,
	IE_EFFECT_CARTOON = 7,
	IE_EFFECT_SHARPEN = 8,
	IE_EFFECT_SOFT_GLOW = 9,
	IE_EFFECT_MAGIC_PEN = 10,
	IE_EFFECT_OIL_PAINT = 11,
	IE_EFFECT_POSTERISE = 12,
	IE_EFFECT_SKETCH = 13,
	IE_EFFECT_BLUR = 14,
	IE_EFFECT_RETRO = 15,
	IE_EFFECT_BLUEWASH = 16,
	IE_EFFECT_SUNSHINE = 17,
	IE_EFFECT_NOSTALGIA = 18,
	IE_EFFECT_DOWNLIGHT = 19,
	IE_EFFECT_YELLOW_GLOW = 20
};

/* One row of the effect catalogue shown by the effect view. */
typedef struct {
	int32_t effect;
	const char *text_id;
	int32_t thumbnail_preview;
} Effect_Info;

#define IE_EFFECT_TABLE_ROWS 21
extern const Effect_Info effect_table[IE_EFFECT_TABLE_ROWS];

int IEL_Rotate_Image(const IEL_Image *src, IEL_Image *dst, unsigned int rotation);
/* The upright picture from one stored in EXIF orientation 1 to 8. */
int IEL_Orient_Image(const IEL_Image *src, IEL_Image *dst, unsigned int orientation);
int IEL_Resize_Image(const IEL_Image *src, IEL_Image *dst);
/* Area-average reduction of a BGRA picture to a size no larger on either
 * side; the reducer takes the source's rows as they come, top down. */
typedef struct IEL_Reducer IEL_Reducer;
int IEL_Reduce_Image(const IEL_Image *src, IEL_Image *dst);
int IEL_Reducer_Create(uint32_t src_width, uint32_t src_height, IEL_Image *dst, IEL_Reducer **reducer);
int IEL_Reducer_Push(IEL_Reducer *reducer, const uint8_t *rows, uint32_t count);
void IEL_Reducer_Destroy(IEL_Reducer *reducer);
uint32_t IEL_Bilinear_Sample(double x, double y, const uint32_t *src, int width);
int IEL_Alpha_blending(const IEL_Image *effect, IEL_Image *inout, float alpha);
int IEL_Variable_Blur_BGRA888_skip(const IEL_Image *src, IEL_Image *dst, IEL_RowSumBufInfo *info,
				   unsigned int level, uint8_t column_step, uint8_t row_step);
int IEL_Run_Effect(IEL_Image *src, IEL_Image *dst, unsigned int effect);
int IEL_Posterize(const IEL_Image *src, IEL_Image *dst, int strength);
int IEL_Magic_Pen(const IEL_Image *src, IEL_Image *dst);
int IEL_Oil_Paint(const IEL_Image *src, IEL_Image *dst);
int IEL_Cartoon(const IEL_Image *src, IEL_Image *dst);
int IEL_Sketch(const IEL_Image *src, IEL_Image *dst);
int IEL_Crop_Image(const IEL_Image *src, IEL_Image *dst, int x, int y);

#ifdef __cplusplus
}
#endif

#endif
