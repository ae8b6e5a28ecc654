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
		kit::Floats negative_row(static_cast<size_t>(width));
		kit::BlurredRows negative(width, height, std::max(1.f, extent / 400.f), [&](int y) {
			const float *l = luma.row(y);
			for (int x = 0; x < width; ++x)
				negative_row[size_t(x)] = 255.f - l[x];
			return negative_row.data();
		});
		kit::BlurredRows tone(width, height, std::max(1.f, extent / 200.f), [&](int y) { return luma.row(y); });

		constexpr float PRESSURE[3] = {0.65f, 1.f, 1.4f};
		const float pressure = PRESSURE[pencil - 1];
		kit::Floats rows(size_t(width) * 2);
		float *dark = rows.data(), *toned = dark + width;
		for (int y = 0; y < height; ++y) {
			negative.row(y, dark);
			tone.row(y, toned);
			const float *l = luma.row(y);
			const uint8_t *t = texture + size_t(y) * size_t(width) * 4;
			uint8_t *o = out + size_t(y) * size_t(width) * 3;
			for (int x = 0; x < width; ++x, t += 4, o += 3) {
				float dodge = std::min(255.f, l[x] * 255.f / std::max(1.f, 255.f - dark[x]));
				float line = std::min(1.f, (255.f - dodge) / 255.f * 3.f * pressure);
				/* How dark the region is, 0 (light) to 1 (black);
				 * mid-tones lean light, as a drawing's do. */
				float shadow = 1.f - kit::smoothstep(20.f, 190.f, toned[x]);
				shadow = std::min(1.f, shadow * std::sqrt(shadow) * pressure);
				const float paper_r = float(t[2]), paper_g = float(t[1]), paper_b = float(t[0]);
				float stroke = 1.f - (0.299f * paper_r + 0.587f * paper_g + 0.114f * paper_b) / 240.f;
				/* A stroke shows where the shadow asks for one as dark. */
				float threshold = (1.f - shadow) * 0.7f;
				float reveal = kit::smoothstep(threshold - 0.08f, threshold + 0.08f, stroke);
				float mix = 0.08f + 0.92f * reveal;
				float pencil_mark = 1.f - 0.8f * line;
				o[0] = kit::clamp_byte((255.f - (255.f - paper_r) * mix) * pencil_mark);
				o[1] = kit::clamp_byte((255.f - (255.f - paper_g) * mix) * pencil_mark);
				o[2] = kit::clamp_byte((255.f - (255.f - paper_b) * mix) * pencil_mark);
			}
		}
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
