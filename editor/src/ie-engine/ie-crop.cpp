/* IEL_Crop_Image: copies the rectangle of the destination's size whose
 * top-left pixel is (x, y) in the source into the destination, row by row.
 * Neither record's size or format changes; nothing is logged.
 * The destination may be the source's own buffer (the same pbBuf): the
 * region's rows then move to the buffer's start, packed, and the bytes
 * after them are left as they happen to be. Each row lands at or before
 * where it was read and ends before the next row to read begins, so
 * nothing is overwritten before it is read. Any other overlap of the two
 * buffers is not allowed.
 * Edge policy: a rectangle reaching outside the source (x or y negative, or
 * past the right or bottom edge) is refused before any byte is copied. */
#include <string.h>

#include "ie-engine-private.h"

int IEL_Crop_Image(const IEL_Image *src, IEL_Image *dst, int x, int y)
{
	if (!src || !dst || !src->pbBuf || !dst->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	if (src->u32Width == 0 || src->u32Height == 0)
		return IEL_ERR_INVALID_SIZE;
	if (!iel_format_known(src->eFormat))
		return IEL_ERR_UNSUPPORTED_FORMAT;
	const size_t b = iel_bytes_per_pixel(src->eFormat);
	const uint64_t src_width = src->u32Width, src_height = src->u32Height;
	const uint64_t width = dst->u32Width, height = dst->u32Height;
	if (src_width < width || src_height < height)
		return IEL_ERR_INVALID_PARAM;
	if (x < 0 || y < 0 || x + width > src_width || y + height > src_height)
		return IEL_ERR_INVALID_PARAM;
	int ok = 0;
	iel_byte_count(src->u32Width, src->u32Height, b, &ok);
	if (!ok)
		return IEL_ERR_INVALID_SIZE;

	const size_t row_bytes = b * width;
	if (dst->pbBuf == src->pbBuf) {
		/* A row may overlap its own new place (the first one when y is 0). */
		for (size_t r = y; r < y + height; r++)
			memmove(dst->pbBuf + (r - y) * row_bytes, src->pbBuf + b * (r * src_width + x), row_bytes);
		return IEL_OK;
	}
	for (size_t r = y; r < y + height; r++)
		memcpy(dst->pbBuf + (r - y) * row_bytes, src->pbBuf + b * (r * src_width + x), row_bytes);
	return IEL_OK;
}
