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

} // namespace
