#include "engine-effects.h"
#include "kuwahara.h"

namespace pee {
namespace {

constexpr int TAPS = 3;
constexpr float INVERSE_TAPS = 1.f / float(2 * TAPS + 1);
constexpr uint32_t NOISE_SALT = 0x011;

/* The streak at (x, y): the noise averaged along the stroke, which runs
 * across the gradient of the flow (diagonally where it is flat); `up`,
 * `mid` and `down` are the flow's rows around y. */
inline float streak_at(const float *up, const float *mid, const float *down, int width, int height,
		       const uint8_t *noise, float step, int x, int y)
{
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
/* Row y of the streaks from x = 1 on, eight pixels a step with the noise
 * taps as gathers; returns where the reference takes over. */
int streak_row_avx2(const float *up, const float *mid, const float *down, int width, int height, const uint8_t *noise,
		    float step, int y, float *dst)
{
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

/* Bristle streaks, a row of the flow's grid at a time, in order:
 * position-hashed noise averaged along the strokes. The flow's rows are
 * blurred as they are needed and kept three at a time. */
class StreakRows {
public:
	StreakRows(kit::BlurredRows &flow, int width, int height, float step, kit::Path path)
		: flow_(flow), width_(width), height_(height), step_(step), path_(path),
		  /* Three spare bytes: a gather reads four from the last one. */
		  noise_(size_t(width) * size_t(height) + 3), flow_rows_(size_t(width) * 3), streaks_(size_t(width))
	{
		for (int y = 0; y < height; ++y) {
			uint8_t *row = &noise_[size_t(y) * size_t(width)];
#if KIT_X86
			if (path == kit::Path::AVX2) {
				noise_row_avx2(width, uint32_t(y), row);
				continue;
			}
#endif
			for (int x = 0; x < width; ++x)
				row[x] = uint8_t(kit::hash2(uint32_t(x), uint32_t(y), NOISE_SALT) >> 24);
		}
	}

	const float *row(int y)
	{
		while (blurred_to_ < std::min(y + 1, height_ - 1)) {
			++blurred_to_;
			flow_.row(blurred_to_, flow_row(blurred_to_));
		}
		const float *up = flow_row(std::max(y - 1, 0)), *mid = flow_row(y), *down = flow_row(std::min(y + 1, height_ - 1));
		const uint8_t *noise = noise_.data();
		float *dst = streaks_.data();
		int x = 0;
#if KIT_X86
		if (path_ == kit::Path::AVX2 && width_ > 1) {
			dst[0] = streak_at(up, mid, down, width_, height_, noise, step_, 0, y);
			x = streak_row_avx2(up, mid, down, width_, height_, noise, step_, y, dst);
		}
#endif
		for (; x < width_; ++x)
			dst[x] = streak_at(up, mid, down, width_, height_, noise, step_, x, y);
		return dst;
	}

private:
	float *flow_row(int y) { return &flow_rows_[size_t(y % 3) * size_t(width_)]; }

	kit::BlurredRows &flow_;
	int width_, height_;
	float step_;
	kit::Path path_;
	int blurred_to_ = -1;
	std::vector<uint8_t> noise_;
	kit::Floats flow_rows_, streaks_;
};

} // namespace

/* Oil paint: thick brush strokes. A wide Kuwahara filter turns the
 * picture into dabs of flat colour; bristle streaks follow the strokes,
 * and the streaks and the dabs' borders are lit from the top left as if
 * the paint stood up from the canvas. Each stage hands its rows on as the
 * next one asks for them, so that no plane of the picture's size is made
 * unless a wide blur must read the whole picture first. */
namespace {

inline int oil_paint_body(const uint8_t *in, uint8_t *out, int width, int height)
{
	return kit::guarded([&] {
		const kit::Path path = kit::best_path();
		const float extent = float(std::max(width, height));
		/* Streaks are drawn on a half-size grid on large pictures: they
		 * are several pixels long there anyway. */
		const int grid = extent >= 640.f ? 2 : 1;
		const float flow_sigma = std::max(1.f, extent / 300.f / float(grid));
		const float relief_sigma = std::max(0.6f, extent / 1600.f);

		/* The dabs, red, green and blue rows side by side, kept from the
		 * row being drawn to the furthest one the blurs below have read. */
		KuwaharaRows dabs(in, width, height, std::max(2, int(extent / 160.f)), path);
		kit::RowWindow paint(3 * width, 32,
				     [&](int, float *row) { dabs.next(row, row + width, row + 2 * width); });

		/* The relief is the paint's luma, made a row at a time. */
		kit::Floats relief_row(static_cast<size_t>(width));
		auto relief = [&](int y) {
			const float *r = paint.row(y), *g = r + width, *b = g + width;
			for (int x = 0; x < width; ++x)
				relief_row[size_t(x)] = 0.299f * r[x] + 0.587f * g[x] + 0.114f * b[x];
			return relief_row.data();
		};
		const int flow_width = (width + grid - 1) / grid, flow_height = (height + grid - 1) / grid;
		kit::Floats row_sum(static_cast<size_t>(flow_width)), shrunk(static_cast<size_t>(flow_width));
		kit::BlurredRows flow(flow_width, flow_height, flow_sigma, [&](int y) {
			kit::shrink_row(width, height, grid, y, relief, row_sum.data(), shrunk.data(), path);
			return shrunk.data();
		});
		StreakRows streaks(flow, flow_width, flow_height, std::max(1.f, extent / 420.f / float(grid)), path);
		kit::Expander streak_rows(flow_width, flow_height, [&](int y) { return streaks.row(y); }, grid, width, height);
		kit::BlurredRows relief_rows(width, height, relief_sigma, relief);

		/* Bristle marks are finer than a pixel of a thumbnail: there they
		 * would only add noise, so they fade with the picture's size. */
		const float bristle_depth = 0.9f * std::clamp(extent / 1280.f, 0.3f, 1.f);
		/* The rows above and below each output row, of the blurred relief
		 * and the enlarged streaks, in rings of three. */
		kit::Floats rings(size_t(width) * 6);
		auto relief_at = [&](int y) { return &rings[size_t(y % 3) * size_t(width)]; };
		auto streaks_at = [&](int y) { return &rings[size_t(3 + y % 3) * size_t(width)]; };
		kit::Floats shades(static_cast<size_t>(width)), lit(size_t(width) * 3);
		int made = -1;
		for (int y = 0; y < height; ++y) {
			paint.keep_from(y);
			const int above = std::max(y - 1, 0), below = std::min(y + 1, height - 1);
			while (made < below) {
				++made;
				relief_rows.row(made, relief_at(made));
				streak_rows.row(made, streaks_at(made));
			}
			const float *relief_above = relief_at(above), *relief_below = relief_at(below);
			const float *streaks_above = streaks_at(above), *streaks_below = streaks_at(below);
			auto shade = [&](int left, int right) {
				float edge_light = relief_above[left] - relief_below[right];
				float bristle = streaks_above[left] - streaks_below[right];
				return edge_light * 0.8f + bristle * bristle_depth * float(grid);
			};
			/* The edge columns apart, so that the inner ones read in
			 * order. */
			float *shade_row = shades.data();
			shade_row[0] = shade(0, std::min(1, width - 1));
			for (int x = 1; x < width - 1; ++x)
				shade_row[x] = shade(x - 1, x + 1);
			if (width > 1)
				shade_row[width - 1] = shade(width - 2, width - 1);
			/* Taken after the rows below were made, which may move it. */
			const float *r = paint.row(y), *g = r + width, *b = g + width;
			float *lit_r = lit.data(), *lit_g = lit_r + width, *lit_b = lit_g + width;
			for (int x = 0; x < width; ++x) {
				lit_r[x] = r[x] + shade_row[x];
				lit_g[x] = g[x] + shade_row[x];
				lit_b[x] = b[x] + shade_row[x];
			}
			kit::write_row(lit_r, lit_g, lit_b, out + size_t(y) * size_t(width) * 3, width, 3, path);
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
