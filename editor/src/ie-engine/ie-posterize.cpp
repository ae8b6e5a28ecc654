/* IEL_Posterize: reduces every byte (alpha included) to L evenly spaced
 * levels, L = 8 - strength (7 for strength 0), through the table
 * table[k] = ((k x L) >> 8) x 255 / (L - 1). Strengths outside 0 to 6 are
 * refused: 7 would divide by zero and 8 and above give an all-black table.
 * No edges: each byte maps on its own; rows are width x bytes per pixel. */
#include <immintrin.h>

#include "ie-engine-private.h"

namespace {

constexpr int kLargestStrength = 6;

inline int levels_of(int strength)
{
	return strength == 0 ? 7 : 8 - strength;
}

}

void iel_posterize_table(int strength, uint8_t table[256])
{
	const unsigned int levels = levels_of(strength);
	const unsigned int divisor = levels - 1;
	for (unsigned int k = 0; k < 256; k++)
		table[k] = static_cast<uint8_t>(((k * levels) >> 8) * 255 / divisor);
}

void iel_posterize_reference(const uint8_t *src, uint8_t *dst, size_t count, const uint8_t table[256])
{
	for (size_t i = 0; i < count; i++)
		dst[i] = table[src[i]];
}

/* The level index (k x L) >> 8 is at most 7, so the table reduces to eight
 * entries that one byte shuffle looks up, 32 bytes a step. */
__attribute__((target("avx2"))) void iel_posterize_avx2(const uint8_t *src, uint8_t *dst, size_t count, int strength)
{
	const int levels = levels_of(strength);
	alignas(16) uint8_t level_values[16] = {};
	for (int q = 0; q < levels; q++)
		level_values[q] = static_cast<uint8_t>(q * 255 / (levels - 1));
	const __m256i lookup = _mm256_broadcastsi128_si256(_mm_load_si128(reinterpret_cast<const __m128i *>(level_values)));
	const __m256i multiplier = _mm256_set1_epi16(static_cast<int16_t>(levels));
	const __m256i zero = _mm256_setzero_si256();
	size_t i = 0;
	for (; i + 32 <= count; i += 32) {
		const __m256i v = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(src + i));
		const __m256i lo = _mm256_srli_epi16(_mm256_mullo_epi16(_mm256_unpacklo_epi8(v, zero), multiplier), 8);
		const __m256i hi = _mm256_srli_epi16(_mm256_mullo_epi16(_mm256_unpackhi_epi8(v, zero), multiplier), 8);
		const __m256i level = _mm256_packus_epi16(lo, hi);
		_mm256_storeu_si256(reinterpret_cast<__m256i *>(dst + i), _mm256_shuffle_epi8(lookup, level));
	}
	uint8_t table[256];
	iel_posterize_table(strength, table);
	iel_posterize_reference(src + i, dst + i, count - i, table);
}

int IEL_Posterize(const IEL_Image *src, IEL_Image *dst, int strength)
{
	if (!src || !dst || !src->pbBuf || !dst->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	if (src->u32Width == 0 || src->u32Height == 0)
		return IEL_ERR_INVALID_SIZE;
	if (!iel_format_known(src->eFormat))
		return IEL_ERR_UNSUPPORTED_FORMAT;
	if (strength < 0 || strength > kLargestStrength)
		return IEL_ERR_INVALID_PARAM;
	int ok = 0;
	const size_t count = iel_byte_count(src->u32Width, src->u32Height, iel_bytes_per_pixel(src->eFormat), &ok);
	if (!ok)
		return IEL_ERR_INVALID_SIZE;
	if (iel_cpu_has_avx2()) {
		iel_posterize_avx2(src->pbBuf, dst->pbBuf, count, strength);
	} else {
		uint8_t table[256];
		iel_posterize_table(strength, table);
		iel_posterize_reference(src->pbBuf, dst->pbBuf, count, table);
	}
	return IEL_OK;
}
