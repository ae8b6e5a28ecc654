#include "look.h"
#include "photoeditoreffects.h"

namespace {

/* Three flat ink strengths per channel. */
constexpr uint8_t INK[3] = {16, 150, 250};
constexpr int SATURATION = 560;
/* A boosted channel, l + (c - l) * SATURATION / 256, lies within
 * [-BOOST_REACH, 255 + BOOST_REACH]. */
constexpr int BOOST_REACH = 255 * SATURATION / 256 + 1;

/* Everything a row of the print reads. */
struct Print {
	const uint8_t *ink_of;
	uint8_t palette[2][27][4];
	/* Boosted values from which the middle and the top ink start. */
	int middle_from, top_from;
};

void row_reference(const Print &print, const uint8_t *off_dot, const unsigned char *src, unsigned char *dst,
		   int x0, int width)
{
	src += size_t(x0) * 4;
	dst += size_t(x0) * 4;
	for (int x = x0; x < width; ++x, src += 4, dst += 4) {
		int b = src[0], g = src[1], r = src[2];
		int l = kit::luma(r, g, b);
		int lr = print.ink_of[l + ((r - l) * SATURATION >> 8)];
		int lg = print.ink_of[l + ((g - l) * SATURATION >> 8)];
		int lb = print.ink_of[l + ((b - l) * SATURATION >> 8)];
		std::memcpy(dst, print.palette[off_dot[x]][lr * 9 + lg * 3 + lb], 4);
	}
}

#if KIT_X86
#pragma GCC push_options
#pragma GCC target("avx2")
/* Eight pixels a step. The contrast curve rises, so a value's ink is which
 * of the two thresholds it reaches, and the palette entry is built from
 * each channel's ink directly. */
void row_avx2(const Print &print, const uint8_t *off_dot, const unsigned char *src,
					      unsigned char *dst, int width)
{
	const __m256i low_byte = _mm256_set1_epi32(0xff);
	const __m256i opaque = _mm256_set1_epi32(int(0xff000000u));
	const __m256i below_middle = _mm256_set1_epi32(print.middle_from - 1);
	const __m256i below_top = _mm256_set1_epi32(print.top_from - 1);
	const __m256i boost = _mm256_set1_epi32(SATURATION);
	const __m256i bottom_ink = _mm256_set1_epi32(INK[0]), middle_ink = _mm256_set1_epi32(INK[1]);
	const __m256i top_ink = _mm256_set1_epi32(INK[2]);
	int x = 0;
	for (; x + 8 <= width; x += 8) {
		const __m256i px = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(src + size_t(x) * 4));
		const __m256i b = _mm256_and_si256(px, low_byte);
		const __m256i g = _mm256_and_si256(_mm256_srli_epi32(px, 8), low_byte);
		const __m256i r = _mm256_and_si256(_mm256_srli_epi32(px, 16), low_byte);
		const __m256i l = _mm256_srli_epi32(
			_mm256_add_epi32(_mm256_add_epi32(_mm256_mullo_epi32(r, _mm256_set1_epi32(77)),
							  _mm256_mullo_epi32(g, _mm256_set1_epi32(150))),
					 _mm256_mullo_epi32(b, _mm256_set1_epi32(29))),
			8);
		int64_t dots;
		std::memcpy(&dots, off_dot + x, 8);
		const __m256i lifted = _mm256_cmpgt_epi32(_mm256_cvtepu8_epi32(_mm_cvtsi64_si128(dots)), _mm256_setzero_si256());
		const __m256i middle = _mm256_blendv_epi8(middle_ink, top_ink, lifted);
		auto ink = [&](__m256i c) {
			const __m256i v = _mm256_add_epi32(l, _mm256_srai_epi32(_mm256_mullo_epi32(_mm256_sub_epi32(c, l), boost), 8));
			const __m256i at_middle = _mm256_blendv_epi8(bottom_ink, middle, _mm256_cmpgt_epi32(v, below_middle));
			return _mm256_blendv_epi8(at_middle, top_ink, _mm256_cmpgt_epi32(v, below_top));
		};
		const __m256i pixel = _mm256_or_si256(_mm256_or_si256(ink(b), _mm256_slli_epi32(ink(g), 8)),
						      _mm256_or_si256(_mm256_slli_epi32(ink(r), 16), opaque));
		_mm256_storeu_si256(reinterpret_cast<__m256i *>(dst + size_t(x) * 4), pixel);
	}
	row_reference(print, off_dot, src, dst, x, width);
}
#pragma GCC pop_options
#endif

} // namespace

/* Pop art: a screen-printed poster. Colours pushed to full strength and
 * flattened to a few bold inks per channel (at most 27 colours), the
 * middle inks printed as dots on light paper. The dots grow with the
 * picture, so a thumbnail shows the same print as the full picture. */
int applyPopArt(const unsigned char *in, unsigned char *out, int width, int height)
{
	if (!pee::bgra_arguments_usable(in, out, width, height))
		return kit::RESULT_BAD_ARGUMENT;
	return kit::guarded([&] {
		/* Contrast, then the ink each boosted value falls to, for the
		 * whole reach of a boosted value so that nothing needs a clamp. */
		const kit::Curve contrast = kit::make_curve({0.f, 255.f, 1.f, 0.6f});
		uint8_t ink_table[256 + 2 * BOOST_REACH];
		for (int i = 0; i < 256 + 2 * BOOST_REACH; ++i) {
			int v = contrast.map[std::clamp(i - BOOST_REACH, 0, 255)];
			ink_table[i] = v < 80 ? 0 : (v < 176 ? 1 : 2);
		}
		Print print;
		print.ink_of = ink_table + BOOST_REACH;
		/* Every ink combination as a whole BGRA pixel, by 9 red + 3 green
		 * + blue; a second set with the middle inks lifted for pixels off
		 * a dot. */
		for (int i = 0; i < 27; ++i) {
			const int levels[3] = {i / 9, i / 3 % 3, i % 3};
			for (int lifted = 0; lifted < 2; ++lifted) {
				uint8_t *p = print.palette[lifted][i];
				int r = levels[0], g = levels[1], b = levels[2];
				if (lifted) {
					r += r == 1;
					g += g == 1;
					b += b == 1;
				}
				p[0] = INK[b];
				p[1] = INK[g];
				p[2] = INK[r];
				p[3] = 255;
			}
		}
		int falls = 0;
		print.middle_from = print.top_from = BOOST_REACH + 256;
		for (int i = 0; i < 256 + 2 * BOOST_REACH; ++i) {
			falls += i > 0 && ink_table[i] < ink_table[i - 1];
			if (ink_table[i] >= 1)
				print.middle_from = std::min(print.middle_from, i - BOOST_REACH);
			if (ink_table[i] >= 2)
				print.top_from = std::min(print.top_from, i - BOOST_REACH);
		}
		/* The thresholds stand for the table only while it never falls. */
		const bool vector = kit::best_path() == kit::Path::AVX2 && falls == 0;
		const int cell = std::max(4, std::max(width, height) / 90);
		const int radius_sq = cell * cell * 9 / 40;
		/* Eight spare entries: the vector path reads a row's flags eight
		 * at a time. */
		std::vector<uint8_t> off_dot(static_cast<size_t>(width) + 8);
		for (int y = 0; y < height; ++y) {
			/* Dots on a grid whose alternate rows are offset by half a cell. */
			const int cy = y % cell - cell / 2;
			const int shift = (y / cell) % 2 ? cell / 2 : 0;
			/* (x + shift) mod cell, stepped rather than divided. */
			for (int x = 0, phase = shift % cell; x < width; ++x) {
				int cx = phase - cell / 2;
				off_dot[size_t(x)] = cx * cx + cy * cy > radius_sq;
				if (++phase == cell)
					phase = 0;
			}
			size_t row = size_t(y) * size_t(width) * 4;
#if KIT_X86
			if (vector) {
				row_avx2(print, off_dot.data(), in + row, out + row, width);
				continue;
			}
#endif
			row_reference(print, off_dot.data(), in + row, out + row, 0, width);
		}
		return int(kit::RESULT_OK);
	});
}
