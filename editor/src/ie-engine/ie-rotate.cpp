/* IEL_Rotate_Image: rotation by a quarter turn.
 * Value 1 turns clockwise: output pixel (column y, row x) is source pixel
 * (column x, row H-1-y). Value 3 turns counter-clockwise: output pixel
 * (column j, row k) is source pixel (column W-1-k, row j). Both give an
 * output H wide and W high. Every other value up to 9 (2 included) copies the
 * picture unchanged; above 9 is refused. Pixels are copied as whole units of
 * the format's bytes, so there is no edge policy: every output pixel has
 * exactly one source pixel. */
#include <immintrin.h>
#include <string.h>

#include "ie-engine-private.h"

namespace {

constexpr unsigned int kTurnRight = 1;
constexpr unsigned int kTurnLeft = 3;
constexpr unsigned int kLargestRotation = 9;

/* Source index of output pixel (row r, column c) of an output H wide. */
inline size_t rotated_source_index(size_t r, size_t c, size_t width, size_t height, unsigned int rotation)
{
	return rotation == kTurnRight ? (height - 1 - c) * width + r : c * width + (width - 1 - r);
}

/* Output rows [row_begin, row_end), columns [col_begin, H), one pixel at a time. */
void rotate32_rest(const uint32_t *src, uint32_t *dst, size_t width, size_t height, unsigned int rotation,
		   size_t row_begin, size_t row_end, size_t col_begin)
{
	for (size_t r = row_begin; r < row_end; r++)
		for (size_t c = col_begin; c < height; c++)
			dst[r * height + c] = src[rotated_source_index(r, c, width, height, rotation)];
}

}

void iel_rotate_reference(const uint8_t *src, uint8_t *dst, uint32_t width, uint32_t height,
			  int bytes_per_pixel, unsigned int rotation)
{
	const size_t w = width, h = height, b = bytes_per_pixel;
	if (rotation == kTurnRight) {
		for (size_t x = 0; x < w; x++)
			for (size_t y = 0; y < h; y++)
				memcpy(dst + (x * h + y) * b, src + ((h - 1 - y) * w + x) * b, b);
	} else if (rotation == kTurnLeft) {
		for (size_t k = 0; k < w; k++)
			for (size_t j = 0; j < h; j++)
				memcpy(dst + (k * h + j) * b, src + (j * w + (w - 1 - k)) * b, b);
	} else if (w * h != 0) {
		memcpy(dst, src, w * h * b);
	}
}

/* Square tiles keep both the source column walk and the output rows in
 * cache; 32 pixels of 4 bytes are two cache lines per tile row. */
void iel_rotate32_tiled(const uint32_t *src, uint32_t *dst, uint32_t width, uint32_t height,
			unsigned int rotation)
{
	constexpr size_t kTile = 32;
	const size_t w = width, h = height;
	for (size_t r0 = 0; r0 < w; r0 += kTile) {
		const size_t r1 = r0 + kTile < w ? r0 + kTile : w;
		for (size_t c0 = 0; c0 < h; c0 += kTile) {
			const size_t c1 = c0 + kTile < h ? c0 + kTile : h;
			for (size_t r = r0; r < r1; r++)
				for (size_t c = c0; c < c1; c++)
					dst[r * h + c] = src[rotated_source_index(r, c, w, h, rotation)];
		}
	}
}

namespace {

__attribute__((target("avx2"))) inline void transpose8x8(__m256i v[8])
{
	__m256i t[8], u[8];
	for (int i = 0; i < 8; i += 2) {
		t[i] = _mm256_unpacklo_epi32(v[i], v[i + 1]);
		t[i + 1] = _mm256_unpackhi_epi32(v[i], v[i + 1]);
	}
	for (int i = 0; i < 8; i += 4) {
		u[i] = _mm256_unpacklo_epi64(t[i], t[i + 2]);
		u[i + 1] = _mm256_unpackhi_epi64(t[i], t[i + 2]);
		u[i + 2] = _mm256_unpacklo_epi64(t[i + 1], t[i + 3]);
		u[i + 3] = _mm256_unpackhi_epi64(t[i + 1], t[i + 3]);
	}
	for (int i = 0; i < 4; i++) {
		v[i] = _mm256_permute2x128_si256(u[i], u[i + 4], 0x20);
		v[i + 4] = _mm256_permute2x128_si256(u[i], u[i + 4], 0x31);
	}
}

/* Output rows r0..r0+7, columns c0..c0+7 through one 8 x 8 transpose. */
__attribute__((target("avx2"))) inline void rotate32_block8(const uint32_t *src, uint32_t *dst, size_t w,
							   size_t h, unsigned int rotation, size_t r0,
							   size_t c0)
{
	__m256i v[8];
	if (rotation == kTurnRight) {
		/* Source rows H-1-c0 upwards, columns r0..r0+7: after the
		 * transpose, vector j is output row r0+j. */
		for (int i = 0; i < 8; i++)
			v[i] = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(src + (h - 1 - c0 - i) * w + r0));
		transpose8x8(v);
		for (int j = 0; j < 8; j++)
			_mm256_storeu_si256(reinterpret_cast<__m256i *>(dst + (r0 + j) * h + c0), v[j]);
	} else {
		/* Source rows c0 downwards, columns W-8-r0..W-1-r0: vector j
		 * is source column W-8-r0+j, which is output row r0+7-j. */
		const size_t x0 = w - 8 - r0;
		for (int i = 0; i < 8; i++)
			v[i] = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(src + (c0 + i) * w + x0));
		transpose8x8(v);
		for (int j = 0; j < 8; j++)
			_mm256_storeu_si256(reinterpret_cast<__m256i *>(dst + (r0 + 7 - j) * h + c0), v[j]);
	}
}

}

/* Strips of output rows several 8 x 8 blocks high, so that each source row
 * is read in whole 64-byte lines while the strip's output rows stay in
 * cache; the rest of the picture goes 8 rows, then one pixel, at a time. */
__attribute__((target("avx2"))) void iel_rotate32_avx2(const uint32_t *src, uint32_t *dst, uint32_t width,
							uint32_t height, unsigned int rotation)
{
	constexpr size_t kStrip = 32;
	const size_t w = width, h = height;
	size_t r0 = 0;
	for (; r0 + kStrip <= w; r0 += kStrip) {
		size_t c0 = 0;
		for (; c0 + 8 <= h; c0 += 8)
			for (size_t block = 0; block < kStrip; block += 8)
				rotate32_block8(src, dst, w, h, rotation, r0 + block, c0);
		rotate32_rest(src, dst, w, h, rotation, r0, r0 + kStrip, c0);
	}
	for (; r0 + 8 <= w; r0 += 8) {
		size_t c0 = 0;
		for (; c0 + 8 <= h; c0 += 8)
			rotate32_block8(src, dst, w, h, rotation, r0, c0);
		rotate32_rest(src, dst, w, h, rotation, r0, r0 + 8, c0);
	}
	rotate32_rest(src, dst, w, h, rotation, r0, w, 0);
}

int IEL_Rotate_Image(const IEL_Image *src, IEL_Image *dst, unsigned int rotation)
{
	if (rotation > kLargestRotation) {
		IEL_LOG_E("Unknow rot val:%d \n", static_cast<int>(rotation));
		return IEL_ERR_INVALID_PARAM;
	}
	if (!src || !dst)
		return IEL_ERR_INVALID_PARAM;
	const int bytes_per_pixel = iel_bytes_per_pixel(src->eFormat);
	int ok = 0;
	const size_t bytes = iel_byte_count(src->u32Width, src->u32Height, bytes_per_pixel, &ok);
	if (!ok)
		return IEL_ERR_INVALID_SIZE;
	if (bytes && (!src->pbBuf || !dst->pbBuf))
		return IEL_ERR_INVALID_PARAM;

	const uint32_t width = src->u32Width, height = src->u32Height;
	const bool quarter_turn = rotation == kTurnRight || rotation == kTurnLeft;
	const bool word_aligned = (reinterpret_cast<uintptr_t>(src->pbBuf) | reinterpret_cast<uintptr_t>(dst->pbBuf)) % 4 == 0;
	if (quarter_turn && bytes_per_pixel == 4 && bytes && word_aligned) {
		const auto *from = reinterpret_cast<const uint32_t *>(src->pbBuf);
		auto *to = reinterpret_cast<uint32_t *>(dst->pbBuf);
		if (iel_cpu_has_avx2())
			iel_rotate32_avx2(from, to, width, height, rotation);
		else
			iel_rotate32_tiled(from, to, width, height, rotation);
	} else if (bytes) {
		iel_rotate_reference(src->pbBuf, dst->pbBuf, width, height, bytes_per_pixel, rotation);
	}
	dst->u32Width = quarter_turn ? height : width;
	dst->u32Height = quarter_turn ? width : height;
	return IEL_OK;
}
