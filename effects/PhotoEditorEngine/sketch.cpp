#include "engine-effects.h"

namespace pee {

/* Sketch: a pencil drawing on the paper of the texture. Outlines come from
 * a colour dodge of the luminance by its blurred negative (dark only where
 * the picture changes). Shading reveals the texture's hatching: the darker
 * a region, the lighter the strokes that show, so highlights stay clean
 * paper and shadows fill with cross-hatching. `pencil` sets how hard the
 * lines are pressed. */
namespace {

inline int sketch_body(const uint8_t *in, const uint8_t *texture, uint8_t *out, int width, int height, Weight pencil)
{
	return kit::guarded([&] {
		const float extent = float(std::max(width, height));
		const kit::Plane luma = luma_rgb888(in, width, height);
		kit::Plane negative(width, height);
		for (size_t i = 0; i < luma.v.size(); ++i)
			negative.v[i] = 255.f - luma.v[i];
		kit::gaussian_blur(negative, std::max(1.f, extent / 400.f));
		kit::Plane tone = luma;
		kit::gaussian_blur(tone, std::max(1.f, extent / 200.f));

		constexpr float PRESSURE[3] = {0.65f, 1.f, 1.4f};
		const float pressure = PRESSURE[pencil - 1];
		kit::Rgb drawing(width, height);
		for (size_t i = 0; i < luma.v.size(); ++i) {
			float dodge = std::min(255.f, luma.v[i] * 255.f / std::max(1.f, 255.f - negative.v[i]));
			float line = std::min(1.f, (255.f - dodge) / 255.f * 3.f * pressure);
			/* How dark the region is, 0 (light) to 1 (black); mid-tones
			 * lean light, as a drawing's do. */
			float shadow = 1.f - kit::smoothstep(20.f, 190.f, tone.v[i]);
			shadow = std::min(1.f, shadow * std::sqrt(shadow) * pressure);
			const uint8_t *t = texture + i * 4;
			const float paper[3] = {float(t[2]), float(t[1]), float(t[0])};
			float stroke = 1.f - (0.299f * paper[0] + 0.587f * paper[1] + 0.114f * paper[2]) / 240.f;
			/* A stroke shows where the shadow asks for one as dark. */
			float threshold = (1.f - shadow) * 0.7f;
			float reveal = kit::smoothstep(threshold - 0.08f, threshold + 0.08f, stroke);
			float mix = 0.08f + 0.92f * reveal;
			float *dst[3] = {&drawing.r.v[i], &drawing.g.v[i], &drawing.b.v[i]};
			for (int c = 0; c < 3; ++c) {
				float v = 255.f - (255.f - paper[c]) * mix;
				*dst[c] = v * (1.f - 0.8f * line);
			}
		}
		write_rgb888(drawing, out);
		return int(kit::RESULT_OK);
	});
}

int sketch_reference(const uint8_t *in, const uint8_t *texture, uint8_t *out, int width, int height, Weight pencil)
{
	return sketch_body(in, texture, out, width, height, pencil);
}

#if KIT_X86
__attribute__((target("avx2"), flatten)) int sketch_avx2(const uint8_t *in, const uint8_t *texture, uint8_t *out, int width, int height, Weight pencil)
{
	return sketch_body(in, texture, out, width, height, pencil);
}
#endif

} // namespace

int sketch(const uint8_t *in, const uint8_t *texture, uint8_t *out, int width, int height, Weight pencil)
{
#if KIT_X86
	if (kit::best_path() == kit::Path::AVX2)
		return sketch_avx2(in, texture, out, width, height, pencil);
#endif
	return sketch_reference(in, texture, out, width, height, pencil);
}

} // namespace pee
