#include "engine-effects.h"

#include <climits>

namespace pee {
namespace {

/* Colour sums pack red, green and blue in 21-bit lanes; luma sums pack the
 * luma in the low 32 bits and its square in the high 32. Unsigned
 * arithmetic wraps, so packed lanes add and subtract exactly as long as
 * every window's lanes fit. */
constexpr int COLOUR_LANE = 21;
constexpr uint64_t COLOUR_MASK = (uint64_t(1) << COLOUR_LANE) - 1;

struct Packed {
	uint64_t colour, luma;
};

} // namespace

kit::Rgb kuwahara(const uint8_t *rgb, int width, int height, int wanted_radius)
{
	/* A window of (radius + 1)^2 bytes must fit a colour lane, and its
	 * squared luma 32 bits. */
	const int radius = std::clamp(wanted_radius, 1, 40);
	const int size = radius + 1;
	std::vector<Packed> pixels(size_t(width) * size_t(height));
	for (size_t i = 0; i < pixels.size(); ++i) {
		uint64_t r = rgb[i * 3], g = rgb[i * 3 + 1], b = rgb[i * 3 + 2];
		uint64_t l = uint64_t(kit::luma(int(r), int(g), int(b)));
		pixels[i] = {r | g << COLOUR_LANE | b << (2 * COLOUR_LANE), l | (l * l) << 32};
	}

	/* The picture is padded by `radius` on every side with its border
	 * repeated, so every quadrant holds size^2 pixels. Row sums of each
	 * padded row (windows of `size` starting at each padded column) are
	 * kept for the 2 * radius + 1 rows the current output row reads, in a
	 * ring; the upper and lower quadrants' column sums slide down with the
	 * output row. Nothing picture-sized is allocated besides the result. */
	const int windows = width + radius;
	const int ring_rows = 2 * radius + 2;
	std::vector<Packed> ring(size_t(ring_rows) * size_t(windows));
	std::vector<Packed> line(size_t(width + 2 * radius));
	auto row_sums = [&](int padded_y) {
		const Packed *row = &pixels[size_t(std::clamp(padded_y - radius, 0, height - 1)) * size_t(width)];
		std::fill(line.begin(), line.begin() + radius, row[0]);
		std::copy(row, row + width, line.begin() + radius);
		std::fill(line.begin() + radius + width, line.end(), row[width - 1]);
		Packed *dst = &ring[size_t(padded_y % ring_rows) * size_t(windows)];
		Packed sum{0, 0};
		for (int x = 0; x < size; ++x) {
			sum.colour += line[size_t(x)].colour;
			sum.luma += line[size_t(x)].luma;
		}
		for (int x = 0;; ++x) {
			dst[x] = sum;
			if (x + 1 == windows)
				break;
			sum.colour += line[size_t(x + size)].colour - line[size_t(x)].colour;
			sum.luma += line[size_t(x + size)].luma - line[size_t(x)].luma;
		}
	};
	auto ring_row = [&](int padded_y) { return &ring[size_t(padded_y % ring_rows) * size_t(windows)]; };
	for (int y = 0; y <= 2 * radius; ++y)
		row_sums(y);
	std::vector<Packed> upper(size_t(windows), Packed{0, 0}), lower(size_t(windows), Packed{0, 0});
	for (int y = 0; y <= radius; ++y) {
		const Packed *a = ring_row(y), *b = ring_row(y + radius);
		for (int x = 0; x < windows; ++x) {
			upper[size_t(x)].colour += a[x].colour;
			upper[size_t(x)].luma += a[x].luma;
			lower[size_t(x)].colour += b[x].colour;
			lower[size_t(x)].luma += b[x].luma;
		}
	}

	const int64_t n = int64_t(size) * size;
	const float inverse_n = 1.f / float(n);
	kit::Rgb dst(width, height);
	for (int y = 0; y < height; ++y) {
		for (int x = 0; x < width; ++x) {
			const Packed *quadrants[4] = {&upper[size_t(x)], &upper[size_t(x + radius)], &lower[size_t(x)],
						      &lower[size_t(x + radius)]};
			/* n^2 times each variance: the same order, no division. The
			 * choice is made without branches, which would mispredict on
			 * every other pixel. */
			uint64_t best = quadrants[0]->colour;
			int64_t best_spread = INT64_MAX;
			for (const Packed *q : quadrants) {
				const int64_t s = int64_t(q->luma & 0xffffffffu), sq = int64_t(q->luma >> 32);
				const int64_t spread = n * sq - s * s;
				const bool smaller = spread < best_spread;
				best_spread = smaller ? spread : best_spread;
				best = smaller ? q->colour : best;
			}
			size_t i = size_t(y) * size_t(width) + size_t(x);
			dst.r.v[i] = float(best & COLOUR_MASK) * inverse_n;
			dst.g.v[i] = float(best >> COLOUR_LANE & COLOUR_MASK) * inverse_n;
			dst.b.v[i] = float(best >> (2 * COLOUR_LANE)) * inverse_n;
		}
		if (y + 1 == height)
			break;
		/* Slide both windows down a row: the new bottom row enters the
		 * ring where the row no longer needed was. */
		row_sums(y + 2 * radius + 1);
		const Packed *upper_in = ring_row(y + radius + 1), *upper_out = ring_row(y);
		const Packed *lower_in = ring_row(y + 2 * radius + 1), *lower_out = ring_row(y + radius);
		for (int x = 0; x < windows; ++x) {
			upper[size_t(x)].colour += upper_in[x].colour - upper_out[x].colour;
			upper[size_t(x)].luma += upper_in[x].luma - upper_out[x].luma;
			lower[size_t(x)].colour += lower_in[x].colour - lower_out[x].colour;
			lower[size_t(x)].luma += lower_in[x].luma - lower_out[x].luma;
		}
	}
	return dst;
}

} // namespace pee
