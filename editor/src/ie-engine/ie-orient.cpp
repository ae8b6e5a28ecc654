/* IEL_Orient_Image: the upright picture from one stored in any of the eight
 * EXIF orientations, in one pass. The orientation o says how the stored rows
 * lie; output pixel (column x, row y) is source pixel:
 *   1  (x, y)            as stored
 *   2  (W-1-x, y)        mirrored left to right
 *   3  (W-1-x, H-1-y)    half turn
 *   4  (x, H-1-y)        mirrored top to bottom
 *   5  (y, x)            mirrored across the main diagonal
 *   6  (y, H-1-x)        quarter turn clockwise (IEL_Rotate_Image 1)
 *   7  (W-1-y, H-1-x)    mirrored across the other diagonal
 *   8  (W-1-y, x)        quarter turn counter-clockwise (IEL_Rotate_Image 3)
 * 1 to 4 give an output W wide and H high, 5 to 8 one H wide and W high; the
 * routine writes the output's u32Width and u32Height, not its eFormat.
 * Checks first: any other orientation is refused (and logged), as are null
 * records or pixels, a format code outside 1 to 4 and a size whose bytes
 * cannot be addressed; nothing is written then. Pixels move as whole units
 * of their format's bytes (as for rotation), so there is no edge policy:
 * every output pixel has exactly one source pixel. An empty source writes
 * no pixels and only sets the output's size. */
#include <string.h>

#include "ie-engine-private.h"

namespace {

/* Orientation o as three moves: whether output rows come from source
 * columns, and whether the source column and row indices run backwards. */
struct Orient_Moves {
	bool transposed, columns_reversed, rows_reversed;
};

constexpr Orient_Moves kMoves[9] = {
	{ false, false, false }, /* 0: never used */
	{ false, false, false }, { false, true, false }, { false, true, true }, { false, false, true },
	{ true, false, false },  { true, false, true },  { true, true, true },  { true, true, false },
};

constexpr unsigned int kFirstOrientation = 1;
constexpr unsigned int kLastOrientation = 8;

/* The quarter turns that IEL_Rotate_Image already does fast. */
constexpr unsigned int kTurnedRight = 6, kTurnedLeft = 8;
constexpr unsigned int kRotateRight = 1, kRotateLeft = 3;

/* Source index of output pixel (column x, row y). */
inline size_t oriented_source_index(const Orient_Moves &m, size_t x, size_t y, size_t width, size_t height)
{
	const size_t a = m.transposed ? y : x, b = m.transposed ? x : y;
	const size_t sx = m.columns_reversed ? width - 1 - a : a;
	const size_t sy = m.rows_reversed ? height - 1 - b : b;
	return sy * width + sx;
}

}

void iel_orient_reference(const uint8_t *src, uint8_t *dst, uint32_t width, uint32_t height, int bytes_per_pixel,
			  unsigned int orientation)
{
	const Orient_Moves &m = kMoves[orientation];
	const size_t w = width, h = height, b = bytes_per_pixel;
	const size_t out_w = m.transposed ? h : w, out_h = m.transposed ? w : h;
	for (size_t y = 0; y < out_h; y++)
		for (size_t x = 0; x < out_w; x++)
			memcpy(dst + (y * out_w + x) * b, src + oriented_source_index(m, x, y, w, h) * b, b);
}

/* Rows that stay rows are copied whole or walked backwards; rows that come
 * from columns go through square tiles, so that the column walk and the
 * output rows both stay in cache (as in the rotation). */
void iel_orient32_tiled(const uint32_t *src, uint32_t *dst, uint32_t width, uint32_t height,
			unsigned int orientation)
{
	const Orient_Moves &m = kMoves[orientation];
	const size_t w = width, h = height;
	if (!m.transposed) {
		for (size_t y = 0; y < h; y++) {
			const uint32_t *from = src + (m.rows_reversed ? h - 1 - y : y) * w;
			uint32_t *to = dst + y * w;
			if (m.columns_reversed)
				for (size_t x = 0; x < w; x++)
					to[x] = from[w - 1 - x];
			else
				memcpy(to, from, w * sizeof(uint32_t));
		}
		return;
	}
	constexpr size_t kTile = 32;
	const size_t out_w = h, out_h = w;
	for (size_t y0 = 0; y0 < out_h; y0 += kTile) {
		const size_t y1 = y0 + kTile < out_h ? y0 + kTile : out_h;
		for (size_t x0 = 0; x0 < out_w; x0 += kTile) {
			const size_t x1 = x0 + kTile < out_w ? x0 + kTile : out_w;
			for (size_t y = y0; y < y1; y++)
				for (size_t x = x0; x < x1; x++)
					dst[y * out_w + x] = src[oriented_source_index(m, x, y, w, h)];
		}
	}
}

int IEL_Orient_Image(const IEL_Image *src, IEL_Image *dst, unsigned int orientation)
{
	if (orientation < kFirstOrientation || orientation > kLastOrientation) {
		IEL_LOG_E("Unknown orientation:%d \n", static_cast<int>(orientation));
		return IEL_ERR_INVALID_PARAM;
	}
	if (!src || !dst)
		return IEL_ERR_INVALID_PARAM;
	if (!iel_format_known(src->eFormat))
		return IEL_ERR_UNSUPPORTED_FORMAT;
	const int bytes_per_pixel = iel_bytes_per_pixel(src->eFormat);
	int ok = 0;
	const size_t bytes = iel_byte_count(src->u32Width, src->u32Height, bytes_per_pixel, &ok);
	if (!ok)
		return IEL_ERR_INVALID_SIZE;
	if (bytes && (!src->pbBuf || !dst->pbBuf))
		return IEL_ERR_INVALID_PARAM;

	const uint32_t width = src->u32Width, height = src->u32Height;
	const bool word_aligned = (reinterpret_cast<uintptr_t>(src->pbBuf) | reinterpret_cast<uintptr_t>(dst->pbBuf)) % 4 == 0;
	if (bytes && bytes_per_pixel == 4 && word_aligned) {
		const auto *from = reinterpret_cast<const uint32_t *>(src->pbBuf);
		auto *to = reinterpret_cast<uint32_t *>(dst->pbBuf);
		const bool quarter_turn = orientation == kTurnedRight || orientation == kTurnedLeft;
		const unsigned int rotation = orientation == kTurnedRight ? kRotateRight : kRotateLeft;
		if (quarter_turn && iel_cpu_has_avx2())
			iel_rotate32_avx2(from, to, width, height, rotation);
		else if (quarter_turn)
			iel_rotate32_tiled(from, to, width, height, rotation);
		else
			iel_orient32_tiled(from, to, width, height, orientation);
	} else if (bytes) {
		iel_orient_reference(src->pbBuf, dst->pbBuf, width, height, bytes_per_pixel, orientation);
	}
	const bool transposed = kMoves[orientation].transposed;
	dst->u32Width = transposed ? height : width;
	dst->u32Height = transposed ? width : height;
	return IEL_OK;
}
