/* IEL_Alpha_blending: mixes an effect result into the unedited picture at an
 * intensity of 0 to 100. With a = intensity / 100 x 255 (truncated), every
 * colour byte becomes (unedited x (255 - a) + effect x a) >> 8; the division
 * by 256 rather than 255 is intended (full intensity gives effect x 255/256).
 * The alpha byte of each 4-byte pixel keeps the unedited value. No edges:
 * every byte depends only on the bytes at its own index. */
#include <immintrin.h>

#include "ie-engine-private.h"

namespace {

constexpr float kMinAlpha = 0.0f;
constexpr float kMaxAlpha = 100.0f;
constexpr size_t kAlphaByte = 3;

/* The refused value truncated to an int, without the undefined conversion of
 * NaN or of values outside the int range. */
int logged_alpha(float alpha)
{
	if (alpha != alpha)
		return 0;
	if (alpha <= -2147483648.0f)
		return INT32_MIN;
	if (alpha >= 2147483648.0f)
		return INT32_MAX;
	return static_cast<int>(alpha);
}

}

void iel_blend_reference(const uint8_t *effect, uint8_t *inout, size_t count, uint8_t a)
{
	for (size_t i = 0; i < count; i++) {
		if (i % 4 == kAlphaByte)
			continue;
		inout[i] = static_cast<uint8_t>((inout[i] * (255 - a) + effect[i] * a) >> 8);
	}
}

/* 32 bytes a step in 16-bit lanes: the largest sum 255 x 255 fits. */
__attribute__((target("avx2"))) void iel_blend_avx2(const uint8_t *effect, uint8_t *inout, size_t count, uint8_t a)
{
	const __m256i keep_weight = _mm256_set1_epi16(static_cast<int16_t>(255 - a));
	const __m256i effect_weight = _mm256_set1_epi16(a);
	const __m256i alpha_bytes = _mm256_set1_epi32(static_cast<int32_t>(0xff000000u));
	const __m256i zero = _mm256_setzero_si256();
	size_t i = 0;
	for (; i + 32 <= count; i += 32) {
		const __m256i e = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(effect + i));
		const __m256i o = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(inout + i));
		const __m256i lo = _mm256_srli_epi16(
			_mm256_add_epi16(_mm256_mullo_epi16(_mm256_unpacklo_epi8(o, zero), keep_weight),
					 _mm256_mullo_epi16(_mm256_unpacklo_epi8(e, zero), effect_weight)),
			8);
		const __m256i hi = _mm256_srli_epi16(
			_mm256_add_epi16(_mm256_mullo_epi16(_mm256_unpackhi_epi8(o, zero), keep_weight),
					 _mm256_mullo_epi16(_mm256_unpackhi_epi8(e, zero), effect_weight)),
			8);
		const __m256i mixed = _mm256_packus_epi16(lo, hi);
		_mm256_storeu_si256(reinterpret_cast<__m256i *>(inout + i), _mm256_blendv_epi8(mixed, o, alpha_bytes));
	}
	for (; i < count; i++) {
		if (i % 4 == kAlphaByte)
			continue;
		inout[i] = static_cast<uint8_t>((inout[i] * (255 - a) + effect[i] * a) >> 8);
	}
}

int IEL_Alpha_blending(const IEL_Image *effect, IEL_Image *inout, float alpha)
{
	/* Written so that NaN is refused too. */
	if (!(alpha >= kMinAlpha && alpha <= kMaxAlpha)) {
		IEL_LOG_E("IEL_Alpha_blending Invalid  alpha val:%d \n", logged_alpha(alpha));
		return IEL_ERR_INVALID_PARAM;
	}
	if (!effect || !inout || !effect->pbBuf || !inout->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	if (effect->u32Width == 0 || effect->u32Height == 0)
		return IEL_ERR_INVALID_SIZE;
	if (!iel_format_known(effect->eFormat))
		return IEL_ERR_UNSUPPORTED_FORMAT;
	int ok = 0;
	const size_t count = iel_byte_count(effect->u32Width, effect->u32Height, 4, &ok);
	if (!ok)
		return IEL_ERR_INVALID_SIZE;

	const float scaled = static_cast<float>(static_cast<double>(alpha) / 100.0 * 255.0);
	const uint8_t a = static_cast<uint8_t>(static_cast<unsigned int>(scaled));
	if (iel_cpu_has_avx2())
		iel_blend_avx2(effect->pbBuf, inout->pbBuf, count, a);
	else
		iel_blend_reference(effect->pbBuf, inout->pbBuf, count, a);
	return IEL_OK;
}
