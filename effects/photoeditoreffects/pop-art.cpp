#include "look.h"
#include "photoeditoreffects.h"

namespace {

/* Three flat ink strengths per channel. */
constexpr uint8_t INK[3] = {16, 150, 250};
constexpr int SATURATION = 560;
/* A boosted channel, l + (c - l) * SATURATION / 256, lies within
 * [-BOOST_REACH, 255 + BOOST_REACH]. */
constexpr int BOOST_REACH = 255 * SATURATION / 256 + 1;

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
		const uint8_t *ink_of = ink_table + BOOST_REACH;
		/* Every ink combination as a whole BGRA pixel, by 9 red + 3 green
		 * + blue; a second set with the middle inks lifted for pixels off
		 * a dot. */
		uint8_t palette[2][27][4];
		for (int i = 0; i < 27; ++i) {
			const int levels[3] = {i / 9, i / 3 % 3, i % 3};
			for (int lifted = 0; lifted < 2; ++lifted) {
				uint8_t *p = palette[lifted][i];
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
		const int cell = std::max(4, std::max(width, height) / 90);
		const int radius_sq = cell * cell * 9 / 40;
		std::vector<uint8_t> off_dot(static_cast<size_t>(width));
		for (int y = 0; y < height; ++y) {
			/* Dots on a grid whose alternate rows are offset by half a cell. */
			const int cy = y % cell - cell / 2;
			const int shift = (y / cell) % 2 ? cell / 2 : 0;
			for (int x = 0; x < width; ++x) {
				int cx = (x + shift) % cell - cell / 2;
				off_dot[size_t(x)] = cx * cx + cy * cy > radius_sq;
			}
			size_t row = size_t(y) * size_t(width) * 4;
			const unsigned char *src = in + row;
			unsigned char *dst = out + row;
			for (int x = 0; x < width; ++x, src += 4, dst += 4) {
				int b = src[0], g = src[1], r = src[2];
				int l = kit::luma(r, g, b);
				int lr = ink_of[l + ((r - l) * SATURATION >> 8)];
				int lg = ink_of[l + ((g - l) * SATURATION >> 8)];
				int lb = ink_of[l + ((b - l) * SATURATION >> 8)];
				std::memcpy(dst, palette[off_dot[size_t(x)]][lr * 9 + lg * 3 + lb], 4);
			}
		}
		return int(kit::RESULT_OK);
	});
}
