/* IEL_Variable_Blur_BGRA888_skip: box blur of K x K samples (K = 3, 5, 7, 9
 * or 11 by level), dilated so that the kernel takes every n-th row and every
 * s-th column, on all four bytes of each pixel. Running sums make the cost
 * independent of K; the mean is (sum x 2^18 / K^2) >> 18.
 * Edge policy: samples above the picture count as the topmost row of the
 * same row phase (row y mod n), samples below it as the last row, samples
 * left or right of it as the first or last column. Pictures narrower than
 * the kernel's reach or lower than the row step stay inside their rows and
 * rows under this rule. */
#include <immintrin.h>
#include <stdlib.h>
#include <string.h>

#include "ie-engine-private.h"

namespace {

constexpr unsigned int kLargestLevel = 4;
constexpr unsigned int kLargestStep = 10;
constexpr int kShift = 18;

inline int32_t reciprocal(unsigned int radius)
{
	const int32_t size = 2 * static_cast<int32_t>(radius) + 1;
	return (1 << kShift) / (size * size);
}

/* Frees the old block and returns a new zero-filled one; the caller's file
 * and line are there for a debugging build to report and are not used. */
int32_t *buffer_renew(int32_t *old, size_t bytes, const char *file, int line)
{
	(void)file;
	(void)line;
	free(old);
	return static_cast<int32_t *>(calloc(1, bytes));
}

}

unsigned int iel_blur_radius(unsigned int level)
{
	return (level > kLargestLevel ? kLargestLevel : level) + 1;
}

/* Planar sums: plane c, slot j is the row at c x n x L + j x L; column x is
 * at s x R + x within it, with s x R margin columns on each side. */
void iel_blur_reference(const uint8_t *src, uint8_t *dst, uint32_t width, uint32_t height,
			int32_t *planes, unsigned int radius, unsigned int column_step, unsigned int row_step)
{
	const ptrdiff_t w = width, h = height, r = radius, s = column_step, n = row_step;
	const ptrdiff_t margin = s * r;
	const ptrdiff_t row_length = w + 3 * margin;
	const int32_t recip = reciprocal(radius);
	auto sums = [&](int c, ptrdiff_t slot) { return planes + (c * n + slot) * row_length + margin; };
	auto at = [&](ptrdiff_t x, ptrdiff_t y, int c) { return static_cast<int32_t>(src[(y * w + x) * 4 + c]); };

	for (ptrdiff_t j = 0; j < n && j < h; j++)
		for (int c = 0; c < 4; c++) {
			int32_t *sum = sums(c, j);
			for (ptrdiff_t x = 0; x < w; x++) {
				int32_t total = (r + 1) * at(x, j, c);
				for (ptrdiff_t k = 1; k <= r; k++)
					total += at(x, j + k * n < h - 1 ? j + k * n : h - 1, c);
				sum[x] = total;
			}
		}

	int32_t window[4][kLargestStep];
	for (ptrdiff_t y = 0; y < h; y++) {
		const ptrdiff_t j = y % n;
		for (int c = 0; c < 4; c++) {
			int32_t *sum = sums(c, j);
			if (y >= n) {
				const ptrdiff_t added = y + n * r < h - 1 ? y + n * r : h - 1;
				const ptrdiff_t removed = y - n * (r + 1) > j ? y - n * (r + 1) : j;
				for (ptrdiff_t x = 0; x < w; x++)
					sum[x] += at(x, added, c) - at(x, removed, c);
			}
			for (ptrdiff_t i = 0; i <= margin; i++) {
				sum[-i] = sum[0];
				sum[w - 1 + i] = sum[w - 1];
			}
			uint8_t *out = dst + y * w * 4 + c;
			for (ptrdiff_t x = 0; x < s && x < w; x++) {
				int32_t total = 0;
				for (ptrdiff_t t = -r; t <= r; t++)
					total += sum[x + t * s];
				window[c][x] = total;
				out[x * 4] = static_cast<uint8_t>((total * recip) >> kShift);
			}
			for (ptrdiff_t x = s; x < w; x++) {
				int32_t &total = window[c][x % s];
				total += sum[x + margin] - sum[x - s * (r + 1)];
				out[x * 4] = static_cast<uint8_t>((total * recip) >> kShift);
			}
		}
	}
}

namespace {

/* Two pixels' four bytes as eight 32-bit lanes. */
__attribute__((target("avx2"))) inline __m256i load2(const uint8_t *p)
{
	return _mm256_cvtepu8_epi32(_mm_loadl_epi64(reinterpret_cast<const __m128i *>(p)));
}

__attribute__((target("avx2"))) inline __m128i load1(const uint8_t *p)
{
	int32_t pixel;
	memcpy(&pixel, p, 4);
	return _mm_cvtepu8_epi32(_mm_cvtsi32_si128(pixel));
}

__attribute__((target("avx2"))) inline void store_mean(uint8_t *out, __m128i total, __m128i recip)
{
	const __m128i mean = _mm_srli_epi32(_mm_mullo_epi32(total, recip), kShift);
	const __m128i bytes = _mm_packus_epi16(_mm_packus_epi32(mean, mean), mean);
	const int32_t pixel = _mm_cvtsi128_si32(bytes);
	memcpy(out, &pixel, 4);
}

}

/* Interleaved sums: slot j is one row of L four-lane pixels, so one vector
 * holds a pixel's four channel sums and the row updates run two pixels a
 * step. Means never exceed 255, so saturating packs equal the low-8-bit
 * store. */
__attribute__((target("avx2"))) void iel_blur_avx2(const uint8_t *src, uint8_t *dst, uint32_t width,
						    uint32_t height, int32_t *planes, unsigned int radius,
						    unsigned int column_step, unsigned int row_step)
{
	const ptrdiff_t w = width, h = height, r = radius, s = column_step, n = row_step;
	const ptrdiff_t margin = s * r;
	const ptrdiff_t row_length = w + 3 * margin;
	const __m128i recip = _mm_set1_epi32(reciprocal(radius));
	auto slot_row = [&](ptrdiff_t slot) { return planes + (slot * row_length + margin) * 4; };
	auto src_row = [&](ptrdiff_t y) { return src + y * w * 4; };

	for (ptrdiff_t j = 0; j < n && j < h; j++) {
		int32_t *sum = slot_row(j);
		const __m256i centre_weight = _mm256_set1_epi32(static_cast<int32_t>(r + 1));
		ptrdiff_t x = 0;
		for (; x + 2 <= w; x += 2) {
			__m256i total = _mm256_mullo_epi32(load2(src_row(j) + x * 4), centre_weight);
			for (ptrdiff_t k = 1; k <= r; k++)
				total = _mm256_add_epi32(total, load2(src_row(j + k * n < h - 1 ? j + k * n : h - 1) + x * 4));
			_mm256_storeu_si256(reinterpret_cast<__m256i *>(sum + x * 4), total);
		}
		for (; x < w; x++) {
			__m128i total = _mm_mullo_epi32(load1(src_row(j) + x * 4), _mm_set1_epi32(static_cast<int32_t>(r + 1)));
			for (ptrdiff_t k = 1; k <= r; k++)
				total = _mm_add_epi32(total, load1(src_row(j + k * n < h - 1 ? j + k * n : h - 1) + x * 4));
			_mm_storeu_si128(reinterpret_cast<__m128i *>(sum + x * 4), total);
		}
	}

	for (ptrdiff_t y = 0; y < h; y++) {
		const ptrdiff_t j = y % n;
		int32_t *sum = slot_row(j);
		if (y >= n) {
			const uint8_t *added = src_row(y + n * r < h - 1 ? y + n * r : h - 1);
			const uint8_t *removed = src_row(y - n * (r + 1) > j ? y - n * (r + 1) : j);
			ptrdiff_t x = 0;
			for (; x + 2 <= w; x += 2) {
				__m256i *p = reinterpret_cast<__m256i *>(sum + x * 4);
				const __m256i change = _mm256_sub_epi32(load2(added + x * 4), load2(removed + x * 4));
				_mm256_storeu_si256(p, _mm256_add_epi32(_mm256_loadu_si256(p), change));
			}
			for (; x < w; x++) {
				__m128i *p = reinterpret_cast<__m128i *>(sum + x * 4);
				const __m128i change = _mm_sub_epi32(load1(added + x * 4), load1(removed + x * 4));
				_mm_storeu_si128(p, _mm_add_epi32(_mm_loadu_si128(p), change));
			}
		}
		const __m128i first = _mm_loadu_si128(reinterpret_cast<const __m128i *>(sum));
		const __m128i last = _mm_loadu_si128(reinterpret_cast<const __m128i *>(sum + (w - 1) * 4));
		for (ptrdiff_t i = 1; i <= margin; i++) {
			_mm_storeu_si128(reinterpret_cast<__m128i *>(sum - i * 4), first);
			_mm_storeu_si128(reinterpret_cast<__m128i *>(sum + (w - 1 + i) * 4), last);
		}
		auto column = [&](ptrdiff_t x) { return _mm_loadu_si128(reinterpret_cast<const __m128i *>(sum + x * 4)); };
		uint8_t *out = dst + y * w * 4;
		if (s == 1) {
			__m128i total = _mm_setzero_si128();
			for (ptrdiff_t t = -r; t <= r; t++)
				total = _mm_add_epi32(total, column(t));
			store_mean(out, total, recip);
			for (ptrdiff_t x = 1; x < w; x++) {
				total = _mm_add_epi32(total, _mm_sub_epi32(column(x + r), column(x - r - 1)));
				store_mean(out + x * 4, total, recip);
			}
			continue;
		}
		__m128i window[kLargestStep];
		for (ptrdiff_t x = 0; x < s && x < w; x++) {
			window[x] = _mm_setzero_si128();
			for (ptrdiff_t t = -r; t <= r; t++)
				window[x] = _mm_add_epi32(window[x], column(x + t * s));
			store_mean(out + x * 4, window[x], recip);
		}
		ptrdiff_t phase = 0;
		for (ptrdiff_t x = s; x < w; x++) {
			window[phase] = _mm_add_epi32(window[phase], _mm_sub_epi32(column(x + margin), column(x - s * (r + 1))));
			store_mean(out + x * 4, window[phase], recip);
			if (++phase == s)
				phase = 0;
		}
	}
}

int IEL_Variable_Blur_BGRA888_skip(const IEL_Image *src, IEL_Image *dst, IEL_RowSumBufInfo *info,
				   unsigned int level, uint8_t column_step, uint8_t row_step)
{
	if (!src || !dst || !src->pbBuf || !dst->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	if (src->u32Width == 0 || src->u32Height == 0)
		return IEL_ERR_INVALID_SIZE;
	if (!iel_format_known(src->eFormat))
		return IEL_ERR_UNSUPPORTED_FORMAT;
	if (src->eFormat != IEL_FORMAT_BGRA8888 || dst->eFormat != IEL_FORMAT_BGRA8888) {
		IEL_LOG_E("Only BGRA888 is supported \n");
		return IEL_ERR_UNSUPPORTED_FORMAT;
	}
	if (!info) {
		IEL_LOG_E("Null One row sum buffer info \n");
		return IEL_ERR_INVALID_PARAM;
	}
	/* A step of 0 would divide by zero; the window tables hold 10 phases. */
	if (column_step < 1 || column_step > kLargestStep || row_step < 1 || row_step > kLargestStep) {
		IEL_LOG_E("Invalid skip step:%d,%d \n", column_step, row_step);
		return IEL_ERR_INVALID_PARAM;
	}

	const unsigned int radius = iel_blur_radius(level);
	/* The recorded size covers the n rows of one channel, so that a later
	 * call with a larger row step renews the buffer instead of overrunning
	 * it; with the usual step of 1 it is one row. */
	const uint64_t row_length = static_cast<uint64_t>(src->u32Width) + 3ull * radius * column_step;
	const uint64_t row_bytes = row_step * row_length * 4;
	const uint64_t buffer_bytes = row_bytes * 4;
	int ok = 0;
	iel_byte_count(src->u32Width, src->u32Height, 4, &ok);
	if (!ok || row_bytes > INT32_MAX || buffer_bytes > PTRDIFF_MAX)
		return IEL_ERR_INVALID_SIZE;

	if (info->s32Size < static_cast<int32_t>(row_bytes)) {
		info->s32Size = 0;
		info->ps32Buf = buffer_renew(info->ps32Buf, buffer_bytes, __FILE_NAME__, __LINE__);
		if (!info->ps32Buf) {
			IEL_LOG_E("Failed to new-allocate one row buffer \n");
			return IEL_ERR_ALLOC;
		}
		info->s32Size = static_cast<int32_t>(row_bytes);
	}
	if (!info->ps32Buf) {
		IEL_LOG_E("Failed to allocate ps32SumRowR \n");
		return IEL_ERR_ALLOC;
	}

	if (iel_cpu_has_avx2())
		iel_blur_avx2(src->pbBuf, dst->pbBuf, src->u32Width, src->u32Height, info->ps32Buf, radius,
			      column_step, row_step);
	else
		iel_blur_reference(src->pbBuf, dst->pbBuf, src->u32Width, src->u32Height, info->ps32Buf, radius,
				   column_step, row_step);
	return IEL_OK;
}
