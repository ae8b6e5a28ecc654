/* IEL_Resize_Image and IEL_Bilinear_Sample: bilinear scaling of BGRA
 * pictures, all positions and weights in double precision.
 * Output (x, y) samples the source at ((x - (kx/2 + dw/2)) / kx + sw/2, likewise
 * for y), k = output size / source size, clamped to [0, size - 1.001] so that
 * the 2 x 2 neighbourhood stays inside. Each byte of the pixel is interpolated
 * horizontally, then vertically, and rounded half up.
 * Edge policy: a source one pixel wide or high repeats its edge instead of
 * reading a neighbour that does not exist; the sampler reads a neighbour only
 * when its weight is not zero. */
#include <immintrin.h>
#include <string.h>

#include <new>
#include <vector>

#include "ie-engine-private.h"

namespace {

constexpr double kHalf = 0.5;
constexpr double kEdgeInset = 1.001;

inline uint32_t load_pixel(const uint8_t *p)
{
	uint32_t v;
	memcpy(&v, p, 4);
	return v;
}

/* `right` and `down` are the byte offsets of the right and lower neighbours;
 * 0 repeats the pixel itself. */
inline uint32_t sample(double x, double y, const uint8_t *src, size_t row_bytes, size_t right, size_t down)
{
	const ptrdiff_t ix = static_cast<ptrdiff_t>(x);
	const ptrdiff_t iy = static_cast<ptrdiff_t>(y);
	const double fx = x - static_cast<double>(ix);
	const double fy = y - static_cast<double>(iy);
	const uint8_t *p00 = src + iy * static_cast<ptrdiff_t>(row_bytes) + ix * 4;
	const uint32_t a = load_pixel(p00), b = load_pixel(p00 + right);
	const uint32_t c = load_pixel(p00 + down), d = load_pixel(p00 + down + right);
	uint32_t result = 0;
	for (int shift = 0; shift < 32; shift += 8) {
		const int c00 = (a >> shift) & 0xff, c01 = (b >> shift) & 0xff;
		const int c10 = (c >> shift) & 0xff, c11 = (d >> shift) & 0xff;
		const double top = c00 + (c01 - c00) * fx;
		const double bottom = c10 + (c11 - c10) * fx;
		const int value = static_cast<int>(top + (bottom - top) * fy + kHalf);
		result |= static_cast<uint32_t>(value & 0xff) << shift;
	}
	return result;
}

inline double source_position(uint32_t out, double scale, double out_size, double src_size)
{
	double pos = (out - (scale * kHalf + out_size * kHalf)) / scale + src_size * kHalf;
	if (pos < 0)
		pos = 0;
	if (pos >= src_size - 1)
		pos = src_size - kEdgeInset;
	return pos;
}

}

uint32_t IEL_Bilinear_Sample(double x, double y, const uint32_t *src, int width)
{
	if (!src || width <= 0)
		return 0;
	const double fx = x - static_cast<double>(static_cast<ptrdiff_t>(x));
	const double fy = y - static_cast<double>(static_cast<ptrdiff_t>(y));
	const size_t row_bytes = static_cast<size_t>(width) * 4;
	const size_t right = fx != 0 && width > 1 ? 4 : 0;
	const size_t down = fy != 0 ? row_bytes : 0;
	return sample(x, y, reinterpret_cast<const uint8_t *>(src), row_bytes, right, down);
}

void iel_resize_reference(const uint8_t *src, uint32_t src_width, uint32_t src_height,
			  uint8_t *dst, uint32_t dst_width, uint32_t dst_height)
{
	const double sw = src_width, sh = src_height, dw = dst_width, dh = dst_height;
	const double kx = dw / sw, ky = dh / sh;
	const size_t row_bytes = static_cast<size_t>(src_width) * 4;
	const size_t right = src_width > 1 ? 4 : 0;
	const size_t down = src_height > 1 ? row_bytes : 0;
	uint8_t *out = dst;
	for (uint32_t y = 0; y < dst_height; y++) {
		const double fy = source_position(y, ky, dh, sh);
		for (uint32_t x = 0; x < dst_width; x++) {
			const double fx = source_position(x, kx, dw, sw);
			const uint32_t pixel = sample(fx, fy, src, row_bytes, right, down);
			memcpy(out, &pixel, 4);
			out += 4;
		}
	}
}

namespace {

/* Column positions are the same for every output row: computed once per
 * call into buffers kept by the thread, so that repeated calls neither
 * allocate nor touch fresh pages. */
struct ColumnTable {
	std::vector<int32_t> offset; /* byte offset of the left neighbour */
	std::vector<double> weight;  /* fractional part of the position */
};

/* Null when the table cannot grow; the caller then takes the plain path. */
const ColumnTable *column_table(uint32_t src_width, uint32_t dst_width)
{
	static thread_local ColumnTable table;
	if (table.offset.size() < dst_width) {
		try {
			table.offset.resize(dst_width);
			table.weight.resize(dst_width);
		} catch (const std::bad_alloc &) {
			return nullptr;
		}
	}
	const double sw = src_width, dw = dst_width, kx = dw / sw;
	for (uint32_t x = 0; x < dst_width; x++) {
		const double fx = source_position(x, kx, dw, sw);
		const ptrdiff_t ix = static_cast<ptrdiff_t>(fx);
		table.offset[x] = static_cast<int32_t>(ix * 4);
		table.weight[x] = fx - static_cast<double>(ix);
	}
	return &table;
}

/* One pixel: the same operations as sample(), on the four bytes at once.
 * Multiply and add stay separate instructions (no FMA), as in the scalar
 * code compiled without contraction. */
__attribute__((target("avx2"))) inline __m128i sample_avx2(const uint8_t *row0, const uint8_t *row1,
							    __m256d fx, __m256d fy)
{
	const __m128i top_pair = _mm_loadl_epi64(reinterpret_cast<const __m128i *>(row0));
	const __m128i bottom_pair = _mm_loadl_epi64(reinterpret_cast<const __m128i *>(row1));
	const __m256d c00 = _mm256_cvtepi32_pd(_mm_cvtepu8_epi32(top_pair));
	const __m256d c01 = _mm256_cvtepi32_pd(_mm_cvtepu8_epi32(_mm_srli_si128(top_pair, 4)));
	const __m256d c10 = _mm256_cvtepi32_pd(_mm_cvtepu8_epi32(bottom_pair));
	const __m256d c11 = _mm256_cvtepi32_pd(_mm_cvtepu8_epi32(_mm_srli_si128(bottom_pair, 4)));
	const __m256d top = _mm256_add_pd(c00, _mm256_mul_pd(_mm256_sub_pd(c01, c00), fx));
	const __m256d bottom = _mm256_add_pd(c10, _mm256_mul_pd(_mm256_sub_pd(c11, c10), fx));
	const __m256d mixed = _mm256_add_pd(top, _mm256_mul_pd(_mm256_sub_pd(bottom, top), fy));
	return _mm256_cvttpd_epi32(_mm256_add_pd(mixed, _mm256_set1_pd(kHalf)));
}

}

/* Weights inside [0, 1) keep every channel inside [0, 255.5), so saturating
 * packs equal the scalar low-8-bit store. */
__attribute__((target("avx2"))) void iel_resize_avx2(const uint8_t *src, uint32_t src_width,
						      uint32_t src_height, uint8_t *dst, uint32_t dst_width,
						      uint32_t dst_height)
{
	const ColumnTable *table = column_table(src_width, dst_width);
	if (!table) {
		iel_resize_reference(src, src_width, src_height, dst, dst_width, dst_height);
		return;
	}
	const int32_t *offset = table->offset.data();
	const double *weight = table->weight.data();
	const double sh = src_height, dh = dst_height, ky = dh / sh;
	const size_t row_bytes = static_cast<size_t>(src_width) * 4;
	uint8_t *out = dst;
	for (uint32_t y = 0; y < dst_height; y++) {
		const double pos = source_position(y, ky, dh, sh);
		const size_t iy = static_cast<size_t>(pos);
		const __m256d fy = _mm256_set1_pd(pos - static_cast<double>(iy));
		const uint8_t *row0 = src + iy * row_bytes;
		const uint8_t *row1 = row0 + row_bytes;
		uint32_t x = 0;
		for (; x + 4 <= dst_width; x += 4) {
			const __m128i p0 = sample_avx2(row0 + offset[x], row1 + offset[x], _mm256_set1_pd(weight[x]), fy);
			const __m128i p1 = sample_avx2(row0 + offset[x + 1], row1 + offset[x + 1],
						       _mm256_set1_pd(weight[x + 1]), fy);
			const __m128i p2 = sample_avx2(row0 + offset[x + 2], row1 + offset[x + 2],
						       _mm256_set1_pd(weight[x + 2]), fy);
			const __m128i p3 = sample_avx2(row0 + offset[x + 3], row1 + offset[x + 3],
						       _mm256_set1_pd(weight[x + 3]), fy);
			const __m128i packed = _mm_packus_epi16(_mm_packus_epi32(p0, p1), _mm_packus_epi32(p2, p3));
			_mm_storeu_si128(reinterpret_cast<__m128i *>(out), packed);
			out += 16;
		}
		for (; x < dst_width; x++) {
			const __m128i p = sample_avx2(row0 + offset[x], row1 + offset[x], _mm256_set1_pd(weight[x]), fy);
			const int32_t pixel = _mm_cvtsi128_si32(_mm_packus_epi16(_mm_packus_epi32(p, p), p));
			memcpy(out, &pixel, 4);
			out += 4;
		}
	}
}

namespace {

/* All-lane masks: the zero-masking forms avoid the "undefined" pass-through
 * operands of the plain intrinsics, which GCC 12 reports as uninitialised. */
constexpr __mmask8 kAll4 = 0x0f;
constexpr __mmask8 kAll8 = 0xff;
constexpr __mmask16 kAll16 = 0xffff;

/* Two pixels in one 512-bit vector: the same operations as sample(), with
 * each pixel's weights repeated over its four lanes. */
__attribute__((target("avx512f"))) inline __m256i sample2_avx512(const uint8_t *row0, const uint8_t *row1,
								  int32_t offset_a, int32_t offset_b, __m512d fx,
								  __m512d fy)
{
	/* Interleaving the two pairs puts both left neighbours in the low
	 * half and both right neighbours in the high half. */
	const __m128i top = _mm_unpacklo_epi32(_mm_loadl_epi64(reinterpret_cast<const __m128i *>(row0 + offset_a)),
					       _mm_loadl_epi64(reinterpret_cast<const __m128i *>(row0 + offset_b)));
	const __m128i bottom = _mm_unpacklo_epi32(_mm_loadl_epi64(reinterpret_cast<const __m128i *>(row1 + offset_a)),
						  _mm_loadl_epi64(reinterpret_cast<const __m128i *>(row1 + offset_b)));
	const __m512i top_lanes = _mm512_maskz_cvtepu8_epi32(kAll16, top);
	const __m512i bottom_lanes = _mm512_maskz_cvtepu8_epi32(kAll16, bottom);
	const __m512d c00 = _mm512_maskz_cvtepi32_pd(kAll8, _mm512_maskz_extracti64x4_epi64(kAll4, top_lanes, 0));
	const __m512d c01 = _mm512_maskz_cvtepi32_pd(kAll8, _mm512_maskz_extracti64x4_epi64(kAll4, top_lanes, 1));
	const __m512d c10 = _mm512_maskz_cvtepi32_pd(kAll8, _mm512_maskz_extracti64x4_epi64(kAll4, bottom_lanes, 0));
	const __m512d c11 = _mm512_maskz_cvtepi32_pd(kAll8, _mm512_maskz_extracti64x4_epi64(kAll4, bottom_lanes, 1));
	const __m512d upper = _mm512_add_pd(c00, _mm512_mul_pd(_mm512_sub_pd(c01, c00), fx));
	const __m512d lower = _mm512_add_pd(c10, _mm512_mul_pd(_mm512_sub_pd(c11, c10), fx));
	const __m512d mixed = _mm512_add_pd(upper, _mm512_mul_pd(_mm512_sub_pd(lower, upper), fy));
	return _mm512_maskz_cvttpd_epi32(kAll8, _mm512_add_pd(mixed, _mm512_set1_pd(kHalf)));
}

__attribute__((target("avx512f"))) inline __m512d pair_weights(const double *weight)
{
	const __m512i lanes = _mm512_set_epi64(1, 1, 1, 1, 0, 0, 0, 0);
	return _mm512_maskz_permutexvar_pd(kAll8, lanes, _mm512_zextpd128_pd512(_mm_loadu_pd(weight)));
}

}

/* Four pixels a step in two vectors; the unsigned narrowing store equals the
 * low-8-bit store as every channel is inside [0, 255]. */
__attribute__((target("avx512f"))) void iel_resize_avx512(const uint8_t *src, uint32_t src_width,
							   uint32_t src_height, uint8_t *dst, uint32_t dst_width,
							   uint32_t dst_height)
{
	const ColumnTable *table = column_table(src_width, dst_width);
	if (!table) {
		iel_resize_reference(src, src_width, src_height, dst, dst_width, dst_height);
		return;
	}
	const int32_t *offset = table->offset.data();
	const double *weight = table->weight.data();
	const double sh = src_height, dh = dst_height, ky = dh / sh;
	const size_t row_bytes = static_cast<size_t>(src_width) * 4;
	uint8_t *out = dst;
	for (uint32_t y = 0; y < dst_height; y++) {
		const double pos = source_position(y, ky, dh, sh);
		const size_t iy = static_cast<size_t>(pos);
		const double row_weight = pos - static_cast<double>(iy);
		const __m512d fy = _mm512_set1_pd(row_weight);
		const uint8_t *row0 = src + iy * row_bytes;
		const uint8_t *row1 = row0 + row_bytes;
		uint32_t x = 0;
		for (; x + 4 <= dst_width; x += 4) {
			const __m256i first = sample2_avx512(row0, row1, offset[x], offset[x + 1], pair_weights(weight + x), fy);
			const __m256i second =
				sample2_avx512(row0, row1, offset[x + 2], offset[x + 3], pair_weights(weight + x + 2), fy);
			const __m512i lanes = _mm512_maskz_inserti64x4(
				kAll8, _mm512_maskz_inserti64x4(kAll8, _mm512_setzero_si512(), first, 0), second, 1);
			_mm_storeu_si128(reinterpret_cast<__m128i *>(out), _mm512_maskz_cvtusepi32_epi8(kAll16, lanes));
			out += 16;
		}
		for (; x < dst_width; x++) {
			const __m128i p = sample_avx2(row0 + offset[x], row1 + offset[x], _mm256_set1_pd(weight[x]),
						      _mm256_set1_pd(row_weight));
			const int32_t pixel = _mm_cvtsi128_si32(_mm_packus_epi16(_mm_packus_epi32(p, p), p));
			memcpy(out, &pixel, 4);
			out += 4;
		}
	}
}

int IEL_Resize_Image(const IEL_Image *src, IEL_Image *dst)
{
	if (!src || !dst)
		return IEL_ERR_INVALID_PARAM;
	if (src->u32Width == 0 || src->u32Height == 0)
		return IEL_ERR_INVALID_SIZE;
	int src_ok = 0, dst_ok = 0;
	iel_byte_count(src->u32Width, src->u32Height, 4, &src_ok);
	const size_t dst_bytes = iel_byte_count(dst->u32Width, dst->u32Height, 4, &dst_ok);
	if (!src_ok || !dst_ok || src->u32Width > INT32_MAX / 4)
		return IEL_ERR_INVALID_SIZE;
	if (!dst_bytes)
		return IEL_OK;
	if (!src->pbBuf || !dst->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	const bool inner_neighbours = src->u32Width >= 2 && src->u32Height >= 2;
	if (inner_neighbours && iel_cpu_has_avx512())
		iel_resize_avx512(src->pbBuf, src->u32Width, src->u32Height, dst->pbBuf, dst->u32Width, dst->u32Height);
	else if (inner_neighbours && iel_cpu_has_avx2())
		iel_resize_avx2(src->pbBuf, src->u32Width, src->u32Height, dst->pbBuf, dst->u32Width, dst->u32Height);
	else
		iel_resize_reference(src->pbBuf, src->u32Width, src->u32Height, dst->pbBuf, dst->u32Width,
				     dst->u32Height);
	return IEL_OK;
}
