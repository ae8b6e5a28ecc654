/* The kit's row-by-row blurs against the plain formulas they stream: a
 * separable convolution with the border repeated, and bilinear enlargement.
 * Both paths of every effect share these, so the path tests cannot see a
 * fault in them; pictures lower than the ring and one pixel wide included. */
#include <gtest/gtest.h>

#include <random>

#include "effect-kit.h"

namespace {

kit::Plane random_plane(int width, int height, uint32_t seed)
{
	std::mt19937 rng(seed);
	std::uniform_real_distribution<float> value(0.f, 255.f);
	kit::Plane p(width, height);
	for (float &v : p.v)
		v = value(rng);
	return p;
}

TEST(EffectKit, NarrowBlurRowsMatchAPlainSeparableConvolution)
{
	for (float sigma : {0.7f, 1.2f, 2.4f}) {
		const std::vector<float> taps = kit::gaussian_taps(sigma);
		const int r = int(taps.size() / 2);
		for (auto [w, h] : std::initializer_list<std::pair<int, int>>{{1, 1}, {1, 9}, {9, 1}, {7, 3}, {40, 2}, {13, 29}}) {
			const kit::Plane src = random_plane(w, h, uint32_t(w * 31 + h));
			kit::Plane across(w, h), want(w, h), got(w, h, -1.f);
			for (int y = 0; y < h; ++y)
				for (int x = 0; x < w; ++x) {
					float sum = 0.f;
					for (int k = -r; k <= r; ++k)
						sum += src.row(y)[std::clamp(x + k, 0, w - 1)] * taps[size_t(k + r)];
					across.row(y)[x] = sum;
				}
			for (int y = 0; y < h; ++y)
				for (int x = 0; x < w; ++x) {
					float sum = 0.f;
					for (int k = -r; k <= r; ++k)
						sum += across.row(std::clamp(y + k, 0, h - 1))[x] * taps[size_t(k + r)];
					want.row(y)[x] = sum;
				}
			kit::gaussian_blur(src, got, sigma);
			EXPECT_TRUE(got.v == want.v) << "sigma " << sigma << " " << w << "x" << h;
		}
	}
}

TEST(EffectKit, ExpandedRowsMatchThePlainBilinearFormula)
{
	for (int factor : {1, 2, 3, 5}) {
		for (auto [w, h] : std::initializer_list<std::pair<int, int>>{{1, 1}, {1, 12}, {12, 1}, {17, 11}, {40, 23}}) {
			const kit::Plane small = random_plane((w + factor - 1) / factor, (h + factor - 1) / factor, uint32_t(factor * 7 + w));
			kit::Plane got(w, h, -1.f);
			kit::expand_into(small, factor, got);
			const float inverse = 1.f / float(factor);
			auto at = [&](int i, int n) {
				float s = std::clamp((float(i) + 0.5f) * inverse - 0.5f, 0.f, float(n - 1));
				return std::make_pair(int(s), s - float(int(s)));
			};
			for (int y = 0; y < h; ++y)
				for (int x = 0; x < w; ++x) {
					auto [x0, fx] = at(x, small.width);
					auto [y0, fy] = at(y, small.height);
					const int x1 = std::min(x0 + 1, small.width - 1), y1 = std::min(y0 + 1, small.height - 1);
					const float *top = small.row(y0), *bottom = small.row(y1);
					float t = top[x0] + (top[x1] - top[x0]) * fx, u = bottom[x0] + (bottom[x1] - bottom[x0]) * fx;
					ASSERT_EQ(got.row(y)[x], t + (u - t) * fy) << "factor " << factor << " " << w << "x" << h << " at " << x << "," << y;
				}
		}
	}
}

/* Block means on both paths, each block summed left to right and the rows'
 * sums added top to bottom; widths around the vector steps (8 pairs, 8
 * blocks) and partial last blocks. */
TEST(EffectKit, ShrunkRowsMatchThePlainBlockMeansOnBothPaths)
{
	std::vector<kit::Path> paths{kit::Path::REFERENCE};
	if (__builtin_cpu_supports("avx2"))
		paths.push_back(kit::Path::AVX2);
	for (int factor : {2, 3, 5}) {
		for (auto [w, h] : std::initializer_list<std::pair<int, int>>{{1, 1}, {1, 5}, {15, 2}, {16, 3}, {17, 4}, {33, 7}, {81, 5}}) {
			const kit::Plane src = random_plane(w, h, uint32_t(factor * 13 + w * 3 + h));
			const int small_width = (w + factor - 1) / factor, small_height = (h + factor - 1) / factor;
			std::vector<float> want(size_t(small_width) * size_t(small_height));
			for (int sy = 0; sy < small_height; ++sy)
				for (int sx = 0; sx < small_width; ++sx) {
					const int y1 = std::min((sy + 1) * factor, h), x1 = std::min((sx + 1) * factor, w);
					float total = 0.f;
					for (int y = sy * factor; y < y1; ++y) {
						float sum = 0.f;
						for (int x = sx * factor; x < x1; ++x)
							sum += src.row(y)[x];
						total += sum;
					}
					want[size_t(sy * small_width + sx)] = total / float((x1 - sx * factor) * (y1 - sy * factor));
				}
			for (kit::Path path : paths) {
				std::vector<float> got(want.size(), -1.f);
				std::vector<float> scratch(static_cast<size_t>(small_width));
				for (int sy = 0; sy < small_height; ++sy)
					kit::shrink_row(w, h, factor, sy, [&](int y) { return src.row(y); }, scratch.data(),
							&got[size_t(sy * small_width)], path);
				EXPECT_TRUE(got == want) << "factor " << factor << " " << w << "x" << h << " path " << int(path);
			}
		}
	}
}

/* A wide blur is the blur of the shrunk picture enlarged; worked out as
 * its rows are given out, it asks for each row once, in order, a few
 * shrunk rows ahead, so that a generator feeding it keeps only those. A
 * picture too thin to shrink by the blur's measure is read whole. */
TEST(EffectKit, WideBlurRowsStreamTheEnlargedBlurOfTheShrunkPicture)
{
	for (float sigma : {3.3f, 5.f, 8.1f, 13.f}) {
		const int factor = int(sigma / 1.6f);
		for (auto [w, h] : std::initializer_list<std::pair<int, int>>{{1, 1}, {3, 50}, {50, 3}, {37, 41}, {120, 7}, {64, 64}}) {
			const kit::Plane src = random_plane(w, h, uint32_t(w * 13 + h));
			kit::Plane want(w, h);
			const int shrink_by = std::min({factor, w, h});
			if (shrink_by >= 2) {
				kit::Plane small = kit::shrink(src, shrink_by);
				kit::gaussian_blur_full(small, std::sqrt(sigma * sigma - float(shrink_by * shrink_by) / 4.f) / float(shrink_by));
				kit::expand_into(small, shrink_by, want);
			} else {
				want = src;
				kit::gaussian_blur_full(want, sigma);
			}
			std::vector<int> asked;
			kit::BlurredRows rows(w, h, sigma, [&](int y) {
				asked.push_back(y);
				return src.row(y);
			});
			const bool streamed = shrink_by == factor;
			if (streamed) {
				EXPECT_TRUE(asked.empty()) << "rows read before any was given out";
			}
			kit::Plane got(w, h, -1.f);
			for (int y = 0; y < h; ++y) {
				rows.row(y, got.row(y));
				if (streamed && !asked.empty()) {
					ASSERT_LE(asked.back(), y + 10 * factor) << "sigma " << sigma << " " << w << "x" << h;
				}
			}
			EXPECT_TRUE(got.v == want.v) << "sigma " << sigma << " " << w << "x" << h;
			std::vector<int> in_order(static_cast<size_t>(h));
			for (int y = 0; y < h; ++y)
				in_order[size_t(y)] = y;
			EXPECT_EQ(asked, in_order) << "sigma " << sigma << " " << w << "x" << h;
		}
	}
}

/* The streamed stages of an effect read one generator from two places at
 * once, far apart: every row must reach each reader as it was made, made
 * once, and rows a reader still needs must survive the store growing. */
TEST(EffectKit, RowWindowKeepsWhatItsReadersStillNeed)
{
	const int width = 5, height = 300;
	auto value = [](int y, int x) { return float(y * 1000 + x); };
	for (int first_room : {1, 8, height}) {
		for (int lead : {0, 3, 40, height}) {
			std::vector<int> made;
			kit::RowWindow window(width, first_room, [&](int y, float *row) {
				made.push_back(y);
				for (int x = 0; x < width; ++x)
					row[x] = value(y, x);
			});
			for (int y = 0; y < height; ++y) {
				window.keep_from(y);
				const float *ahead = window.row(std::min(y + lead, height - 1));
				ASSERT_EQ(ahead[width - 1], value(std::min(y + lead, height - 1), width - 1));
				const float *row = window.row(y);
				for (int x = 0; x < width; ++x)
					ASSERT_EQ(row[x], value(y, x)) << "room " << first_room << " lead " << lead << " row " << y;
			}
			ASSERT_EQ(made.size(), size_t(height));
			for (int y = 0; y < height; ++y)
				ASSERT_EQ(made[size_t(y)], y);
		}
	}
}

/* Output rows asked for in order ask for each small row once, in order:
 * what lets a generator make the small rows as they are needed. */
TEST(EffectKit, ExpanderAsksForEachSmallRowOnceInOrder)
{
	for (int factor : {1, 2, 3}) {
		for (auto [w, h] : std::initializer_list<std::pair<int, int>>{{1, 1}, {7, 1}, {9, 14}, {20, 31}}) {
			const kit::Plane small = random_plane((w + factor - 1) / factor, (h + factor - 1) / factor, uint32_t(w + h));
			kit::Plane want(w, h);
			kit::expand_into(small, factor, want);
			std::vector<int> asked;
			kit::Expander rows(small.width, small.height, [&](int y) {
				asked.push_back(y);
				return small.row(y);
			}, factor, w, h);
			kit::Plane got(w, h, -1.f);
			for (int y = 0; y < h; ++y)
				rows.row(y, got.row(y));
			EXPECT_TRUE(got.v == want.v) << "factor " << factor << " " << w << "x" << h;
			std::vector<int> in_order(size_t(small.height));
			for (int y = 0; y < small.height; ++y)
				in_order[size_t(y)] = y;
			EXPECT_EQ(asked, in_order) << "factor " << factor << " " << w << "x" << h;
		}
	}
}

} // namespace
