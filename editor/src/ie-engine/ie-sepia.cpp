/* Sepia step of the dispatcher (effect code 4). For each pixel, the
 * luminance Y = (G[g] + R[r] + B[b]) >> 10 through tables of i x 0.587,
 * 0.299 and 0.114 scaled by 1024 and rounded; the output bytes 0, 1, 2 are
 * Y, Y + 12 and Y + 50, each held at 255 (the brightest tones go to white
 * rather than wrapping), and byte 3 is copied.
 * Edge policy: pixels of fewer than 4 bytes (formats stepping by 2 or 3)
 * write only their own bytes, and a read past the last pixel counts as 0. */
#include <immintrin.h>
#include <string.h>

#include <array>

#include "ie-engine-private.h"

namespace {

using Table = std::array<int32_t, 256>;

constexpr Table luminance_table(double weight)
{
	Table table{};
	for (int i = 0; i < 256; i++)
		table[i] = static_cast<int32_t>(i * weight * 1024 + 0.5);
	return table;
}

constexpr Table kGreen = luminance_table(0.587);
constexpr Table kRed = luminance_table(0.299);
constexpr Table kBlue = luminance_table(0.114);
static_assert(kGreen[1] == 601 && kRed[1] == 306 && kBlue[1] == 117, "luminance tables");
static_assert(kGreen[255] == 153277 && kRed[255] == 78075 && kBlue[255] == 29768, "luminance tables");

constexpr int kGreenLift = 12;
constexpr int kRedLift = 50;

inline uint8_t lifted(int y, int lift)
{
	return static_cast<uint8_t>(y + lift > 255 ? 255 : y + lift);
}

inline void sepia_pixel(const uint8_t in[4], uint8_t out[4])
{
	const int y = ((kGreen[in[1]] + kRed[in[2]] + kBlue[in[0]]) >> 10) & 0xff;
	out[0] = static_cast<uint8_t>(y);
	out[1] = lifted(y, kGreenLift);
	out[2] = lifted(y, kRedLift);
	out[3] = in[3];
}

}

void iel_sepia_reference(const uint8_t *src, uint8_t *dst, size_t pixels, int bytes_per_pixel)
{
	const size_t b = bytes_per_pixel;
	const size_t total = pixels * b;
	for (size_t i = 0; i < pixels; i++) {
		uint8_t in[4] = {0, 0, 0, 0}, out[4];
		const size_t offset = i * b;
		memcpy(in, src + offset, total - offset < 4 ? total - offset : 4);
		sepia_pixel(in, out);
		memcpy(dst + offset, out, b);
	}
}

/* Eight pixels a step: the three table lookups are gathers from tables that
 * stay in L1, and the lifts are saturating byte adds, which equal the
 * held-at-255 rule. */
__attribute__((target("avx2"))) void iel_sepia_avx2(const uint8_t *src, uint8_t *dst, size_t pixels)
{
	const __m256i low_byte = _mm256_set1_epi32(0xff);
	const __m256i alpha = _mm256_set1_epi32(static_cast<int32_t>(0xff000000u));
	const __m256i lifts = _mm256_set1_epi32(kRedLift << 16 | kGreenLift << 8);
	const __m256i spread = _mm256_set1_epi32(0x00010101);
	size_t i = 0;
	for (; i + 8 <= pixels; i += 8) {
		const __m256i v = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(src + i * 4));
		const __m256i b = _mm256_and_si256(v, low_byte);
		const __m256i g = _mm256_and_si256(_mm256_srli_epi32(v, 8), low_byte);
		const __m256i r = _mm256_and_si256(_mm256_srli_epi32(v, 16), low_byte);
		__m256i sum = _mm256_i32gather_epi32(kGreen.data(), g, 4);
		sum = _mm256_add_epi32(sum, _mm256_i32gather_epi32(kRed.data(), r, 4));
		sum = _mm256_add_epi32(sum, _mm256_i32gather_epi32(kBlue.data(), b, 4));
		const __m256i y = _mm256_and_si256(_mm256_srli_epi32(sum, 10), low_byte);
		const __m256i grey = _mm256_mullo_epi32(y, spread);
		const __m256i toned = _mm256_adds_epu8(grey, lifts);
		_mm256_storeu_si256(reinterpret_cast<__m256i *>(dst + i * 4),
				    _mm256_or_si256(toned, _mm256_and_si256(v, alpha)));
	}
	iel_sepia_reference(src + i * 4, dst + i * 4, pixels - i, 4);
}

void iel_sepia_fast(const uint8_t *src, uint8_t *dst, size_t pixels, int bytes_per_pixel)
{
	if (bytes_per_pixel == 4 && iel_cpu_has_avx2())
		iel_sepia_avx2(src, dst, pixels);
	else
		iel_sepia_reference(src, dst, pixels, bytes_per_pixel);
}
