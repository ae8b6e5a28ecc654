#include "engine-effects.h"
#include "kuwahara.h"

namespace pee {
namespace {

constexpr int TAPS = 3;
constexpr float INVERSE_TAPS = 1.f / float(2 * TAPS + 1);
constexpr uint32_t NOISE_SALT = 0x011;

/* The streak at (x, y): the noise averaged along the stroke, which runs
 * across the gradient of the flow (diagonally where it is flat). */
inline float streak_at(const kit::Plane &flow, const uint8_t *noise, float step, int x, int y)
{
	const int width = flow.width, height = flow.height;
	const float *up = flow.row(std::max(y - 1, 0));
	const float *mid = flow.row(y);
	const float *down = flow.row(std::min(y + 1, height - 1));
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
	return sum * INVERSE_TAPS;
}

#if KIT_X86
#pragma GCC push_options
#pragma GCC target("avx2")
/* Rows y0..y1-1 of the streaks from x = 1 on, eight pixels a step with
 * the noise taps as gathers; returns where the reference takes over. */
int streak_row_avx2(const kit::Plane &flow, const uint8_t *noise, float step, int y, float *dst)
{
	const int width = flow.width, height = flow.height;
	const float *up = flow.row(std::max(y - 1, 0));
	const float *mid = flow.row(y);
	const float *down = flow.row(std::min(y + 1, height - 1));
	const __m256 half = _mm256_set1_ps(0.5f), one = _mm256_set1_ps(1.f), tiny = _mm256_set1_ps(1e-3f);
	const __m256 diagonal = _mm256_set1_ps(0.7071f), steps = _mm256_set1_ps(step);
	const __m256 sign = _mm256_set1_ps(-0.f), inverse_taps = _mm256_set1_ps(INVERSE_TAPS);
	const __m256i last_x = _mm256_set1_epi32(width - 1), last_y = _mm256_set1_epi32(height - 1);
	const __m256i zero = _mm256_setzero_si256(), row_length = _mm256_set1_epi32(width);
	const __m256i low_byte = _mm256_set1_epi32(0xff), rows = _mm256_set1_epi32(y);
	int x = 1;
	for (; x + 8 < width; x += 8) {
		const __m256 gx = _mm256_sub_ps(_mm256_loadu_ps(mid + x + 1), _mm256_loadu_ps(mid + x - 1));
		const __m256 gy = _mm256_sub_ps(_mm256_loadu_ps(down + x), _mm256_loadu_ps(up + x));
		const __m256 len = _mm256_sqrt_ps(_mm256_add_ps(_mm256_mul_ps(gx, gx), _mm256_mul_ps(gy, gy)));
		const __m256 weight = _mm256_min_ps(_mm256_mul_ps(len, half), one);
		const __m256 inverse = _mm256_div_ps(weight, _mm256_max_ps(tiny, len));
		const __m256 flat = _mm256_mul_ps(diagonal, _mm256_sub_ps(one, weight));
		const __m256 tx = _mm256_mul_ps(_mm256_add_ps(_mm256_mul_ps(_mm256_xor_ps(gy, sign), inverse), flat), steps);
		const __m256 ty = _mm256_mul_ps(_mm256_add_ps(_mm256_mul_ps(gx, inverse), flat), steps);
		const __m256i columns = _mm256_add_epi32(_mm256_set1_epi32(x), _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7));
		__m256 sum = _mm256_setzero_ps();
		for (int k = -TAPS; k <= TAPS; ++k) {
			const __m256 reach = _mm256_set1_ps(float(k));
			const __m256i sx = _mm256_min_epi32(
				_mm256_max_epi32(_mm256_add_epi32(columns, _mm256_cvttps_epi32(_mm256_mul_ps(reach, tx))), zero), last_x);
			const __m256i sy = _mm256_min_epi32(
				_mm256_max_epi32(_mm256_add_epi32(rows, _mm256_cvttps_epi32(_mm256_mul_ps(reach, ty))), zero), last_y);
			const __m256i at = _mm256_add_epi32(_mm256_mullo_epi32(sy, row_length), sx);
			const __m256i value = _mm256_and_si256(_mm256_i32gather_epi32(reinterpret_cast<const int *>(noise), at, 1), low_byte);
			sum = _mm256_add_ps(sum, _mm256_cvtepi32_ps(value));
		}
		_mm256_storeu_ps(dst + x, _mm256_mul_ps(sum, inverse_taps));
	}
	return x;
}

/* The noise's position hash, eight columns a step. */
void noise_row_avx2(int width, uint32_t y, uint8_t *dst)
{
	const __m256i row_part = _mm256_set1_epi32(int(y * 0xd8163841u ^ NOISE_SALT * 0xcb1ab31fu));
	const __m256i column_factor = _mm256_set1_epi32(int(0x8da6b343u));
	const __m256i mix1 = _mm256_set1_epi32(0x2c1b3c6d), mix2 = _mm256_set1_epi32(0x297a2d39);
	const __m256i top_bytes = _mm256_setr_epi8(3, 7, 11, 15, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, 3, 7, 11,
						   15, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1);
	int x = 0;
	for (__m256i column = _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7); x + 8 <= width;
	     x += 8, column = _mm256_add_epi32(column, _mm256_set1_epi32(8))) {
		__m256i h = _mm256_xor_si256(_mm256_mullo_epi32(column, column_factor), row_part);
		h = _mm256_xor_si256(h, _mm256_srli_epi32(h, 15));
		h = _mm256_mullo_epi32(h, mix1);
		h = _mm256_xor_si256(h, _mm256_srli_epi32(h, 12));
		h = _mm256_mullo_epi32(h, mix2);
		h = _mm256_xor_si256(h, _mm256_srli_epi32(h, 15));
		const __m256i bytes = _mm256_shuffle_epi8(h, top_bytes);
		const uint32_t low = uint32_t(_mm256_extract_epi32(bytes, 0)), high = uint32_t(_mm256_extract_epi32(bytes, 4));
		const uint64_t eight = uint64_t(low) | uint64_t(high) << 32;
		std::memcpy(dst + x, &eight, 8);
	}
	for (; x < width; ++x)
		dst[x] = uint8_t(kit::hash2(uint32_t(x), y, NOISE_SALT) >> 24);
}
#pragma GCC pop_options
#endif

/* Bristle streaks: position-hashed noise averaged along the strokes. */
kit::Plane bristle_streaks(const kit::Plane &flow, float step, kit::Path path)
{
	const int width = flow.width, height = flow.height;
	/* Three spare bytes: a gather reads four from the last one. */
	std::vector<uint8_t> noise(size_t(width) * size_t(height) + 3);
	for (int y = 0; y < height; ++y) {
		uint8_t *row = &noise[size_t(y) * size_t(width)];
#if KIT_X86
		if (path == kit::Path::AVX2) {
			noise_row_avx2(width, uint32_t(y), row);
			continue;
		}
#endif
		for (int x = 0; x < width; ++x)
			row[x] = uint8_t(kit::hash2(uint32_t(x), uint32_t(y), NOISE_SALT) >> 24);
	}
	kit::Plane streaks(width, height);
	for (int y = 0; y < height; ++y) {
		float *dst = streaks.row(y);
		int x = 0;
#if KIT_X86
		if (path == kit::Path::AVX2 && width > 1) {
			dst[0] = streak_at(flow, noise.data(), step, 0, y);
			x = streak_row_avx2(flow, noise.data(), step, y, dst);
		}
#endif
		for (; x < width; ++x)
			dst[x] = streak_at(flow, noise.data(), step, x, y);
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

		/* The relief is the paint's luma, made a row at a time. */
		kit::Floats relief_row(static_cast<size_t>(width));
		auto relief = [&](int y) {
			const float *r = paint.r.row(y), *g = paint.g.row(y), *b = paint.b.row(y);
			for (int x = 0; x < width; ++x)
				relief_row[size_t(x)] = 0.299f * r[x] + 0.587f * g[x] + 0.114f * b[x];
			return relief_row.data();
		};
		/* Streaks are drawn on a half-size grid on large pictures: they
		 * are several pixels long there anyway. */
		const int grid = extent >= 640.f ? 2 : 1;
		kit::Plane flow = kit::shrink_rows(width, height, grid, relief);
		kit::gaussian_blur(flow, std::max(1.f, extent / 300.f / float(grid)));
		const kit::Plane streaks = bristle_streaks(flow, std::max(1.f, extent / 420.f / float(grid)), kit::best_path());
		kit::Expander streak_rows(streaks, grid, width, height);
		kit::BlurredRows relief_rows(width, height, std::max(0.6f, extent / 1600.f), relief);

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
