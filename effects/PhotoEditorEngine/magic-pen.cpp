#include "engine-effects.h"

namespace pee {

/* Magic pen: the picture redrawn as glowing neon strokes on a dark ground.
 * The edges of the (lightly smoothed) picture become lines in the
 * picture's own colours, richer and at full brightness, with a wide halo
 * of the same colour around them. */
namespace {

inline int magic_pen_body(const uint8_t *in, uint8_t *out, int width, int height)
{
	return kit::guarded([&] {
		const kit::Path path = kit::best_path();
		const float extent = float(std::max(width, height));

		/* The lines, made a row at a time from the luma smoothed as its
		 * rows come (each line row from three smoothed rows), and kept
		 * from the row being drawn to the furthest the halo has read. */
		kit::Floats luma(static_cast<size_t>(width));
		kit::BlurredRows smoothed(width, height, std::max(0.7f, extent / 900.f), [&](int y) {
			kit::luma_row(in + size_t(y) * size_t(width) * 3, width, luma.data(), path);
			return luma.data();
		});
		kit::Floats ring(size_t(width) * 3);
		auto smoothed_at = [&](int y) { return &ring[size_t(y % 3) * size_t(width)]; };
		int smoothed_to = -1;
		kit::RowWindow lines(width, 32, [&](int y, float *line) {
			const int below = std::min(y + 1, height - 1);
			while (smoothed_to < below)
				++smoothed_to, smoothed.row(smoothed_to, smoothed_at(smoothed_to));
			kit::sobel_row(smoothed_at(std::max(y - 1, 0)), smoothed_at(y), smoothed_at(below), width, line);
			for (int x = 0; x < width; ++x)
				line[x] = kit::smoothstep(12.f, 90.f, line[x]);
		});
		kit::BlurredRows halo(width, height, extent / 160.f, [&](int y) { return lines.row(y); });

		/* The stroke colour: the picture's colour smoothed, so that a line
		 * keeps one hue along its length. */
		kit::BlurredRows colour[3] = {
			{width, height, extent / 300.f, kit::ChannelRows(in, width, 3, 0)},
			{width, height, extent / 300.f, kit::ChannelRows(in, width, 3, 1)},
			{width, height, extent / 300.f, kit::ChannelRows(in, width, 3, 2)}};
		kit::Floats rows(size_t(width) * 4);
		float *halo_row = rows.data(), *red = halo_row + width, *green = red + width, *blue = green + width;
		constexpr float BRIGHTEST = 0.85f * 255.f;
		for (int y = 0; y < height; ++y) {
			lines.keep_from(y);
			halo.row(y, halo_row);
			colour[0].row(y, red);
			colour[1].row(y, green);
			colour[2].row(y, blue);
			/* Taken after the halo, whose reading ahead may move it. */
			const float *line = lines.row(y);
			/* Each pixel's colour is replaced by its stroke, then written. */
			for (int x = 0; x < width; ++x) {
				float r = red[x], g = green[x], b = blue[x];
				float l = 0.299f * r + 0.587f * g + 0.114f * b;
				/* Richer, at full brightness, nudged towards white so
				 * that grey edges still shine. */
				r = std::max(0.f, l + (r - l) * 2.2f);
				g = std::max(0.f, l + (g - l) * 2.2f);
				b = std::max(0.f, l + (b - l) * 2.2f);
				float scale = BRIGHTEST / std::max(std::max(std::max(r, g), b), 1.f);
				float light = line[x] + halo_row[x] * 1.6f;
				/* A faint trace of the picture stays as the dark ground. */
				float ground = l * 0.08f;
				red[x] = ground + (r * scale + 38.f) * light;
				green[x] = ground + (g * scale + 38.f) * light;
				blue[x] = ground + (b * scale + 38.f) * light;
			}
			kit::write_row(red, green, blue, out + size_t(y) * size_t(width) * 3, width, 3, path);
		}
		return int(kit::RESULT_OK);
	});
}

int magic_pen_reference(const uint8_t *in, uint8_t *out, int width, int height)
{
	return magic_pen_body(in, out, width, height);
}

#if KIT_X86
__attribute__((target("avx2"), flatten)) int magic_pen_avx2(const uint8_t *in, uint8_t *out, int width, int height)
{
	return magic_pen_body(in, out, width, height);
}
#endif

} // namespace

int magic_pen(const uint8_t *in, uint8_t *out, int width, int height)
{
#if KIT_X86
	if (kit::best_path() == kit::Path::AVX2)
		return magic_pen_avx2(in, out, width, height);
#endif
	return magic_pen_reference(in, out, width, height);
}

} // namespace pee
