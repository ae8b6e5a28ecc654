#include "engine-effects.h"
#include "kuwahara.h"

namespace pee {

/* Cartoon: flat areas of clean colour inside dark ink outlines. The
 * picture is flattened with a Kuwahara filter, its brightness is cut into
 * a few flat bands (colours keep their hue), and ink is laid where a
 * difference of Gaussians finds the dark side of an edge. `outline` sets
 * the width of the ink. */
namespace {

inline int cartoon_body(const uint8_t *in, uint8_t *out, int width, int height, Weight outline)
{
	return kit::guarded([&] {
		const float extent = float(std::max(width, height));
		KuwaharaRows flat(in, width, height, std::max(2, int(extent / 240.f)), kit::best_path());

		constexpr float OUTLINE_SCALE[3] = {0.7f, 1.f, 1.5f};
		const float sigma = std::max(0.7f, extent / 1100.f) * OUTLINE_SCALE[outline - 1];
		const kit::Plane luma = luma_rgb888(in, width, height);
		kit::BlurredRows narrow(width, height, sigma, [&](int y) { return luma.row(y); });
		kit::BlurredRows wide(width, height, sigma * 1.6f, [&](int y) { return luma.row(y); });

		/* Brightness bands: six equal steps, each shown a little above
		 * its middle. */
		constexpr float BAND = 255.f / 6.f;
		/* Each channel's distance from the brightness, boosted a little,
		 * is rounded to steps of this size: few hues per band. */
		constexpr float STEP = 14.f;
		kit::Floats rows(size_t(width) * 5);
		float *red = rows.data(), *green = red + width, *blue = green + width, *near = blue + width,
		      *far = near + width;
		for (int y = 0; y < height; ++y) {
			flat.next(red, green, blue);
			narrow.row(y, near);
			wide.row(y, far);
			uint8_t *o = out + size_t(y) * size_t(width) * 3;
			for (int x = 0; x < width; ++x, o += 3) {
				float r = red[x], g = green[x], b = blue[x];
				float l = 0.299f * r + 0.587f * g + 0.114f * b;
				float banded = (float(int(l / BAND)) + 0.6f) * BAND;
				float edge = near[x] - far[x];
				float ink = kit::smoothstep(1.5f, 5.f, -edge);
				/* Ink in four strengths: soft enough at its rim, flat
				 * like the colours. */
				float keep = 1.f - 0.9f * float(int(ink * 3.f + 0.5f)) / 3.f;
				auto tone = [&](float v) {
					float steps = (v - l) * 1.3f / STEP;
					float chroma = float(int(steps + (steps < 0.f ? -0.5f : 0.5f))) * STEP;
					return kit::clamp_byte(std::clamp(banded + chroma, 0.f, 255.f) * keep);
				};
				o[0] = tone(r);
				o[1] = tone(g);
				o[2] = tone(b);
			}
		}
		return int(kit::RESULT_OK);
	});
}

int cartoon_reference(const uint8_t *in, uint8_t *out, int width, int height, Weight outline)
{
	return cartoon_body(in, out, width, height, outline);
}

#if KIT_X86
__attribute__((target("avx2"), flatten)) int cartoon_avx2(const uint8_t *in, uint8_t *out, int width, int height, Weight outline)
{
	return cartoon_body(in, out, width, height, outline);
}
#endif

} // namespace

int cartoon(const uint8_t *in, uint8_t *out, int width, int height, Weight outline)
{
#if KIT_X86
	if (kit::best_path() == kit::Path::AVX2)
		return cartoon_avx2(in, out, width, height, outline);
#endif
	return cartoon_reference(in, out, width, height, outline);
}

} // namespace pee
