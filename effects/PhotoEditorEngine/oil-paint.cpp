#include "engine-effects.h"
#include "kuwahara.h"

namespace pee {
namespace {

/* Bristle streaks: position-hashed noise averaged along the strokes, which
 * run across the gradient of `flow` (diagonally where it is flat). */
kit::Plane bristle_streaks(const kit::Plane &flow, float step)
{
	const int width = flow.width, height = flow.height;
	std::vector<uint8_t> noise(size_t(width) * size_t(height));
	for (int y = 0; y < height; ++y)
		for (int x = 0; x < width; ++x)
			noise[size_t(y) * size_t(width) + size_t(x)] = uint8_t(kit::hash2(uint32_t(x), uint32_t(y), 0x011) >> 24);
	constexpr int TAPS = 3;
	constexpr float INVERSE_TAPS = 1.f / float(2 * TAPS + 1);
	kit::Plane streaks(width, height);
	for (int y = 0; y < height; ++y) {
		const float *up = &flow.v[size_t(std::max(y - 1, 0)) * size_t(width)];
		const float *mid = &flow.v[size_t(y) * size_t(width)];
		const float *down = &flow.v[size_t(std::min(y + 1, height - 1)) * size_t(width)];
		for (int x = 0; x < width; ++x) {
			float gx = mid[std::min(x + 1, width - 1)] - mid[std::max(x - 1, 0)];
			float gy = down[x] - up[x];
			float len = std::sqrt(gx * gx + gy * gy);
			float weight = std::min(1.f, len * 0.5f);
			float inverse = weight / std::max(len, 1e-3f);
			float tx = (-gy * inverse + 0.7071f * (1.f - weight)) * step;
			float ty = (gx * inverse + 0.7071f * (1.f - weight)) * step;
			float sum = 0.f;
			for (int k = -TAPS; k <= TAPS; ++k) {
				int sx = std::clamp(x + int(float(k) * tx), 0, width - 1);
				int sy = std::clamp(y + int(float(k) * ty), 0, height - 1);
				sum += float(noise[size_t(sy) * size_t(width) + size_t(sx)]);
			}
			streaks.v[size_t(y) * size_t(width) + size_t(x)] = sum * INVERSE_TAPS;
		}
	}
	return streaks;
}

} // namespace

/* Oil paint: thick brush strokes. A wide Kuwahara filter turns the
 * picture into dabs of flat colour; bristle streaks follow the strokes,
 * and the streaks and the dabs' borders are lit from the top left as if
 * the paint stood up from the canvas. */
namespace {

inline int oil_paint_body(const uint8_t *in, uint8_t *out, int width, int height)
{
	return kit::guarded([&] {
		const float extent = float(std::max(width, height));
		kit::Rgb paint = kuwahara(in, width, height, std::max(2, int(extent / 160.f)));

		kit::Plane relief(width, height);
		for (size_t i = 0; i < relief.v.size(); ++i)
			relief.v[i] = 0.299f * paint.r.v[i] + 0.587f * paint.g.v[i] + 0.114f * paint.b.v[i];
		/* Streaks are drawn on a half-size grid on large pictures: they
		 * are several pixels long there anyway. */
		const int grid = extent >= 640.f ? 2 : 1;
		kit::Plane flow = grid > 1 ? kit::shrink(relief, grid) : relief;
		kit::gaussian_blur(flow, std::max(1.f, extent / 300.f / float(grid)));
		const kit::Plane streaks = bristle_streaks(flow, std::max(1.f, extent / 420.f / float(grid)));
		kit::Expander streak_rows(streaks, grid, width, height);
		kit::BlurredRows relief_rows(width, height, std::max(0.6f, extent / 1600.f),
					     [&](int y) { return relief.row(y); });

		/* Bristle marks are finer than a pixel of a thumbnail: there they
		 * would only add noise, so they fade with the picture's size. */
		const float bristle_depth = 0.9f * std::clamp(extent / 1280.f, 0.3f, 1.f);
		/* The rows above and below each output row, of the blurred relief
		 * and the enlarged streaks, in rings of three. */
		kit::Floats rings(size_t(width) * 6);
		auto relief_at = [&](int y) { return &rings[size_t(y % 3) * size_t(width)]; };
		auto streaks_at = [&](int y) { return &rings[size_t(3 + y % 3) * size_t(width)]; };
		int made = -1;
		for (int y = 0; y < height; ++y) {
			const int above = std::max(y - 1, 0), below = std::min(y + 1, height - 1);
			while (made < below) {
				++made;
				relief_rows.row(made, relief_at(made));
				streak_rows.row(made, streaks_at(made));
			}
			const float *relief_above = relief_at(above), *relief_below = relief_at(below);
			const float *streaks_above = streaks_at(above), *streaks_below = streaks_at(below);
			const float *r = paint.r.row(y), *g = paint.g.row(y), *b = paint.b.row(y);
			uint8_t *o = out + size_t(y) * size_t(width) * 3;
			auto shade_at = [&](int x, int left, int right) {
				float edge_light = relief_above[left] - relief_below[right];
				float bristle = streaks_above[left] - streaks_below[right];
				float shade = edge_light * 0.8f + bristle * bristle_depth * float(grid);
				o[size_t(x) * 3] = kit::clamp_byte(r[x] + shade);
				o[size_t(x) * 3 + 1] = kit::clamp_byte(g[x] + shade);
				o[size_t(x) * 3 + 2] = kit::clamp_byte(b[x] + shade);
			};
			/* The edge columns apart, so that the inner ones read in
			 * order. */
			shade_at(0, 0, std::min(1, width - 1));
			for (int x = 1; x < width - 1; ++x)
				shade_at(x, x - 1, x + 1);
			if (width > 1)
				shade_at(width - 1, width - 2, width - 1);
		}
		return int(kit::RESULT_OK);
	});
}

int oil_paint_reference(const uint8_t *in, uint8_t *out, int width, int height)
{
	return oil_paint_body(in, out, width, height);
}

#if KIT_X86
__attribute__((target("avx2"), flatten)) int oil_paint_avx2(const uint8_t *in, uint8_t *out, int width, int height)
{
	return oil_paint_body(in, out, width, height);
}
#endif

} // namespace

int oil_paint(const uint8_t *in, uint8_t *out, int width, int height)
{
#if KIT_X86
	if (kit::best_path() == kit::Path::AVX2)
		return oil_paint_avx2(in, out, width, height);
#endif
	return oil_paint_reference(in, out, width, height);
}

} // namespace pee
