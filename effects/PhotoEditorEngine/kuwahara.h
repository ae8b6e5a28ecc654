/* Kuwahara filter of RGB888 pixels: each pixel takes the mean colour of the
 * least varied of the four (radius + 1)-square quadrants around it (the
 * first on a tie: top left, top right, bottom left, bottom right), the
 * border repeated. Flattens regions while keeping their borders sharp. The
 * radius is kept within 1..40. Rows are made one at a time, in order, from
 * sliding window sums: nothing of the picture's size is held. */
#ifndef PEE_KUWAHARA_H
#define PEE_KUWAHARA_H

#include <climits>

#include "effect-kit.h"

namespace pee {

class KuwaharaRows {
public:
	KuwaharaRows(const uint8_t *rgb, int width, int height, int wanted_radius, kit::Path path)
		: rgb_(rgb), width_(width), height_(height), radius_(std::clamp(wanted_radius, 1, 40)),
		  size_(radius_ + 1), windows_(width + radius_), ring_rows_(2 * radius_ + 2), path_(path),
		  ring_(size_t(ring_rows_) * size_t(windows_)), line_(size_t(width + 2 * radius_)),
		  upper_(size_t(windows_), Packed{0, 0}), lower_(size_t(windows_), Packed{0, 0})
	{
		for (int y = 0; y <= 2 * radius_; ++y)
			row_sums(y);
		for (int y = 0; y <= radius_; ++y) {
			const Packed *a = ring_row(y), *b = ring_row(y + radius_);
			for (int x = 0; x < windows_; ++x) {
				upper_[size_t(x)].colour += a[x].colour;
				upper_[size_t(x)].luma += a[x].luma;
				lower_[size_t(x)].colour += b[x].colour;
				lower_[size_t(x)].luma += b[x].luma;
			}
		}
	}

	/* The next row's mean colours. */
	void next(float *r, float *g, float *b)
	{
		const int64_t n = int64_t(size_) * size_;
		const float inverse_n = 1.f / float(n);
		int x = 0;
#if KIT_X86
		if (path_ == kit::Path::AVX2)
			x = select_avx2(upper_.data(), lower_.data(), radius_, width_, n, inverse_n, r, g, b);
#endif
		select_reference(x, n, inverse_n, r, g, b);
		const int y = y_++;
		if (y + 1 == height_)
			return;
		/* Slide both windows down a row: the new bottom row enters the
		 * ring where the row no longer needed was. */
		row_sums(y + 2 * radius_ + 1);
		slide(upper_.data(), ring_row(y + radius_ + 1), ring_row(y));
		slide(lower_.data(), ring_row(y + 2 * radius_ + 1), ring_row(y + radius_));
	}

private:
	/* Colour sums pack red, green and blue in 21-bit lanes; luma sums pack
	 * the luma in the low 32 bits and its square in the high 32. Unsigned
	 * arithmetic wraps, so packed lanes add and subtract exactly as long as
	 * every window's lanes fit: a window of up to 41^2 bytes fits a colour
	 * lane, and its squared luma 32 bits. */
	static constexpr int COLOUR_LANE = 21;
	static constexpr uint64_t COLOUR_MASK = (uint64_t(1) << COLOUR_LANE) - 1;

	struct Packed {
		uint64_t colour, luma;
	};

	/* A window's sums moved down a row: the row entering added, the one
	 * leaving taken away. */
	void slide(Packed *sums, const Packed *entering, const Packed *leaving) const
	{
		int i = 0;
#if KIT_X86
		if (path_ == kit::Path::AVX2)
			i = slide_avx2(sums, entering, leaving, windows_);
#endif
		for (; i < windows_; ++i) {
			sums[i].colour += entering[i].colour - leaving[i].colour;
			sums[i].luma += entering[i].luma - leaving[i].luma;
		}
	}

	/* Row sums of padded row `padded_y` (the picture padded by `radius` on
	 * every side with its border repeated): windows of `size` starting at
	 * each padded column, into the ring. */
	void row_sums(int padded_y)
	{
		const uint8_t *src = rgb_ + size_t(std::clamp(padded_y - radius_, 0, height_ - 1)) * size_t(width_) * 3;
		Packed *line = line_.data();
		int x = 0;
#if KIT_X86
		if (path_ == kit::Path::AVX2)
			x = pack_avx2(src, width_, line + radius_);
#endif
		for (; x < width_; ++x) {
			const uint8_t *px = src + size_t(x) * 3;
			uint64_t r = px[0], g = px[1], b = px[2];
			uint64_t l = uint64_t(kit::luma(int(r), int(g), int(b)));
			line[radius_ + x] = {r | g << COLOUR_LANE | b << (2 * COLOUR_LANE), l | (l * l) << 32};
		}
		std::fill(line, line + radius_, line[radius_]);
		std::fill(line + radius_ + width_, line + width_ + 2 * radius_, line[radius_ + width_ - 1]);
		Packed *dst = ring_row(padded_y);
		Packed sum{0, 0};
		for (int x = 0; x < size_; ++x) {
			sum.colour += line[x].colour;
			sum.luma += line[x].luma;
		}
		for (int x = 0;; ++x) {
			dst[x] = sum;
			if (x + 1 == windows_)
				break;
			sum.colour += line[x + size_].colour - line[x].colour;
			sum.luma += line[x + size_].luma - line[x].luma;
		}
	}

	Packed *ring_row(int padded_y) { return &ring_[size_t(padded_y % ring_rows_) * size_t(windows_)]; }

	void select_reference(int x0, int64_t n, float inverse_n, float *r, float *g, float *b) const
	{
		for (int x = x0; x < width_; ++x) {
			const Packed *quadrants[4] = {&upper_[size_t(x)], &upper_[size_t(x + radius_)], &lower_[size_t(x)],
						      &lower_[size_t(x + radius_)]};
			/* n^2 times each variance: the same order, no division. The
			 * choice is made without branches, which would mispredict
			 * on every other pixel. */
			uint64_t best = quadrants[0]->colour;
			int64_t best_spread = INT64_MAX;
			for (const Packed *q : quadrants) {
				const int64_t s = int64_t(q->luma & 0xffffffffu), sq = int64_t(q->luma >> 32);
				const int64_t spread = n * sq - s * s;
				const bool smaller = spread < best_spread;
				best_spread = smaller ? spread : best_spread;
				best = smaller ? q->colour : best;
			}
			r[x] = float(best & COLOUR_MASK) * inverse_n;
			g[x] = float(best >> COLOUR_LANE & COLOUR_MASK) * inverse_n;
			b[x] = float(best >> (2 * COLOUR_LANE)) * inverse_n;
		}
	}

#if KIT_X86
	/* Two windows a step; returns the first left. */
	__attribute__((target("avx2"))) static int slide_avx2(Packed *sums, const Packed *entering, const Packed *leaving,
							      int count)
	{
		int i = 0;
		for (; i + 2 <= count; i += 2) {
			__m256i *sum = reinterpret_cast<__m256i *>(sums + i);
			const __m256i in = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(entering + i));
			const __m256i out = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(leaving + i));
			_mm256_storeu_si256(sum, _mm256_add_epi64(_mm256_loadu_si256(sum), _mm256_sub_epi64(in, out)));
		}
		return i;
	}

	/* Pixels packed as row_sums packs them, four a step in 64-bit lanes;
	 * a step reads sixteen bytes for its twelve. Returns the first pixel
	 * left. */
	__attribute__((target("avx2"))) static int pack_avx2(const uint8_t *src, int width, Packed *dst)
	{
		const __m128i reds = _mm_setr_epi8(0, 3, 6, 9, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1);
		const __m128i greens = _mm_setr_epi8(1, 4, 7, 10, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1);
		const __m128i blues = _mm_setr_epi8(2, 5, 8, 11, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1);
		const __m256i red_weight = _mm256_set1_epi64x(77), green_weight = _mm256_set1_epi64x(150);
		const __m256i blue_weight = _mm256_set1_epi64x(29);
		int x = 0;
		for (; 3 * x + 16 <= 3 * width; x += 4) {
			const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i *>(src + size_t(x) * 3));
			const __m256i r = _mm256_cvtepu8_epi64(_mm_shuffle_epi8(bytes, reds));
			const __m256i g = _mm256_cvtepu8_epi64(_mm_shuffle_epi8(bytes, greens));
			const __m256i b = _mm256_cvtepu8_epi64(_mm_shuffle_epi8(bytes, blues));
			const __m256i l = _mm256_srli_epi64(
				_mm256_add_epi64(_mm256_add_epi64(_mm256_mul_epu32(r, red_weight), _mm256_mul_epu32(g, green_weight)),
						 _mm256_mul_epu32(b, blue_weight)),
				8);
			const __m256i colour = _mm256_or_si256(
				r, _mm256_or_si256(_mm256_slli_epi64(g, COLOUR_LANE), _mm256_slli_epi64(b, 2 * COLOUR_LANE)));
			const __m256i luma = _mm256_or_si256(l, _mm256_slli_epi64(_mm256_mul_epu32(l, l), 32));
			/* (colour, luma) of pixels 0 and 2, and of 1 and 3; then in order. */
			const __m256i even = _mm256_unpacklo_epi64(colour, luma), odd = _mm256_unpackhi_epi64(colour, luma);
			_mm256_storeu_si256(reinterpret_cast<__m256i *>(dst + x), _mm256_permute2x128_si256(even, odd, 0x20));
			_mm256_storeu_si256(reinterpret_cast<__m256i *>(dst + x + 2), _mm256_permute2x128_si256(even, odd, 0x31));
		}
		return x;
	}

	/* Four sums in 64-bit lanes (each below 2^21) as means. */
	__attribute__((target("avx2"))) static void store_means(__m256i lanes, __m256i lows, __m256 inverse, float *dst)
	{
		const __m128i values = _mm256_castsi256_si128(_mm256_permutevar8x32_epi32(lanes, lows));
		_mm_storeu_ps(dst, _mm_mul_ps(_mm_cvtepi32_ps(values), _mm256_castps256_ps128(inverse)));
	}

	/* Four pixels a step in 64-bit lanes: the spreads from 32 x 32-bit
	 * products (sums and squares fit 32 bits), the choice by blends.
	 * Returns the first pixel left for the reference. */
	__attribute__((target("avx2"))) static int select_avx2(const Packed *upper, const Packed *lower, int radius,
							       int width, int64_t n, float inverse_n, float *r, float *g,
							       float *b)
	{
		const __m256i n_lanes = _mm256_set1_epi64x(n);
		const __m256i low_half = _mm256_set1_epi64x(0xffffffff);
		const __m256i colour_mask = _mm256_set1_epi64x(int64_t(COLOUR_MASK));
		const __m256i lows = _mm256_setr_epi32(0, 2, 4, 6, 0, 2, 4, 6);
		const __m256 inverse = _mm256_set1_ps(inverse_n);
		int x = 0;
		for (; x + 4 <= width; x += 4) {
			const Packed *quadrants[4] = {upper + x, upper + x + radius, lower + x, lower + x + radius};
			__m256i best = _mm256_setzero_si256();
			__m256i best_spread = _mm256_set1_epi64x(INT64_MAX);
			for (int q = 0; q < 4; ++q) {
				const __m256i a = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(quadrants[q]));
				const __m256i c = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(quadrants[q] + 2));
				/* Pixels x, x + 2 | x + 1, x + 3, then put in order. */
				const __m256i colour = _mm256_permute4x64_epi64(_mm256_unpacklo_epi64(a, c), 0xd8);
				const __m256i luma = _mm256_permute4x64_epi64(_mm256_unpackhi_epi64(a, c), 0xd8);
				const __m256i s = _mm256_and_si256(luma, low_half);
				const __m256i sq = _mm256_srli_epi64(luma, 32);
				const __m256i spread = _mm256_sub_epi64(_mm256_mul_epu32(n_lanes, sq), _mm256_mul_epu32(s, s));
				const __m256i smaller = _mm256_cmpgt_epi64(best_spread, spread);
				best_spread = _mm256_blendv_epi8(best_spread, spread, smaller);
				best = q == 0 ? colour : _mm256_blendv_epi8(best, colour, smaller);
			}
			store_means(_mm256_and_si256(best, colour_mask), lows, inverse, r + x);
			store_means(_mm256_and_si256(_mm256_srli_epi64(best, COLOUR_LANE), colour_mask), lows, inverse, g + x);
			store_means(_mm256_srli_epi64(best, 2 * COLOUR_LANE), lows, inverse, b + x);
		}
		return x;
	}
#endif

	const uint8_t *rgb_;
	int width_, height_, radius_, size_, windows_, ring_rows_;
	kit::Path path_;
	int y_ = 0;
	std::vector<Packed> ring_, line_, upper_, lower_;
};

/* The whole filtered picture as planes. */
inline kit::Rgb kuwahara(const uint8_t *rgb, int width, int height, int radius, kit::Path path = kit::best_path())
{
	kit::Rgb dst(width, height);
	KuwaharaRows rows(rgb, width, height, radius, path);
	for (int y = 0; y < height; ++y)
		rows.next(dst.r.row(y), dst.g.row(y), dst.b.row(y));
	return dst;
}

} // namespace pee

#endif
