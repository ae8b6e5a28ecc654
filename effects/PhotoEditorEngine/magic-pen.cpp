#include "engine-effects.h"

namespace pee {

/* Magic pen: the picture redrawn as glowing neon strokes on a dark ground.
 * The edges of the (lightly smoothed) picture become lines in the
 * picture's own colours, richer and at full brightness, with a wide halo
 * of the same colour around them. */
int magic_pen(const uint8_t *in, uint8_t *out, int width, int height)
{
	return kit::guarded([&] {
		const float extent = float(std::max(width, height));
		kit::Rgb picture = read_rgb888(in, width, height);
		kit::Plane lines = kit::luma_plane(picture);
		kit::gaussian_blur(lines, std::max(0.7f, extent / 900.f));
		lines = kit::sobel_magnitude(lines);
		for (float &v : lines.v)
			v = kit::smoothstep(12.f, 90.f, v);
		kit::Plane halo = lines;
		kit::gaussian_blur(halo, extent / 160.f);

		/* The stroke colour: the picture's colour smoothed, so that a line
		 * keeps one hue along its length. */
		kit::Plane *channels[3] = {&picture.r, &picture.g, &picture.b};
		for (kit::Plane *c : channels)
			kit::gaussian_blur(*c, extent / 300.f);
		for (size_t i = 0; i < lines.v.size(); ++i) {
			float r = picture.r.v[i], g = picture.g.v[i], b = picture.b.v[i];
			float l = 0.299f * r + 0.587f * g + 0.114f * b;
			/* Richer, at full brightness, nudged towards white so that
			 * grey edges still shine. */
			r = std::max(0.f, l + (r - l) * 2.2f);
			g = std::max(0.f, l + (g - l) * 2.2f);
			b = std::max(0.f, l + (b - l) * 2.2f);
			float scale = 0.85f * 255.f / std::max({r, g, b, 1.f});
			float light = lines.v[i] + halo.v[i] * 1.6f;
			/* A faint trace of the picture stays as the dark ground. */
			float ground = l * 0.08f;
			picture.r.v[i] = ground + (r * scale + 38.f) * light;
			picture.g.v[i] = ground + (g * scale + 38.f) * light;
			picture.b.v[i] = ground + (b * scale + 38.f) * light;
		}
		write_rgb888(picture, out);
		return int(kit::RESULT_OK);
	});
}

} // namespace pee
