/* The fast Kuwahara filter (sliding window sums) against the plain
 * definition, borders included. */
#include <gtest/gtest.h>

#include "kuwahara.h"
#include "effects-test-util.h"

namespace {

/* Each quadrant's sums over its (radius + 1)^2 pixels, border repeated; the
 * least varied quadrant (the first on a tie: TL, TR, BL, BR) gives the mean. */
kit::Rgb plain_kuwahara(const std::vector<uint8_t> &rgb, int width, int height, int radius)
{
	kit::Rgb out(width, height);
	const int64_t n = int64_t(radius + 1) * (radius + 1);
	for (int y = 0; y < height; ++y) {
		for (int x = 0; x < width; ++x) {
			int64_t best_spread = INT64_MAX;
			int64_t best[3] = {0, 0, 0};
			for (int qy : {y - radius, y}) {
				for (int qx : {x - radius, x}) {
					int64_t sum[3] = {0, 0, 0}, luma = 0, luma_sq = 0;
					for (int dy = 0; dy <= radius; ++dy) {
						for (int dx = 0; dx <= radius; ++dx) {
							int sx = std::clamp(qx + dx, 0, width - 1), sy = std::clamp(qy + dy, 0, height - 1);
							const uint8_t *p = &rgb[(size_t(sy) * size_t(width) + size_t(sx)) * 3];
							int l = kit::luma(p[0], p[1], p[2]);
							for (int c = 0; c < 3; ++c)
								sum[c] += p[c];
							luma += l;
							luma_sq += l * l;
						}
					}
					int64_t spread = n * luma_sq - luma * luma;
					if (spread < best_spread) {
						best_spread = spread;
						std::copy(sum, sum + 3, best);
					}
				}
			}
			size_t i = size_t(y) * size_t(width) + size_t(x);
			out.r.v[i] = float(best[0]) * (1.f / float(n));
			out.g.v[i] = float(best[1]) * (1.f / float(n));
			out.b.v[i] = float(best[2]) * (1.f / float(n));
		}
	}
	return out;
}

TEST(Kuwahara, MatchesThePlainDefinition)
{
	const int sizes[][2] = {{23, 17}, {1, 9}, {9, 1}, {1, 1}, {40, 3}};
	for (const auto &size : sizes) {
		const int w = size[0], h = size[1];
		const std::vector<uint8_t> rgb = effects_test::bgra_to_rgb(effects_test::photo(w, h));
		for (int radius : {1, 2, 5, 12}) {
			const kit::Rgb plain = plain_kuwahara(rgb, w, h, radius);
			for (kit::Path path : {kit::Path::REFERENCE, kit::Path::AVX2}) {
				if (path == kit::Path::AVX2 && !__builtin_cpu_supports("avx2"))
					continue;
				const kit::Rgb fast = pee::kuwahara(rgb.data(), w, h, radius, path);
				EXPECT_TRUE(fast.r.v == plain.r.v && fast.g.v == plain.g.v && fast.b.v == plain.b.v)
					<< w << "x" << h << " radius " << radius << " path " << int(path);
			}
		}
	}
}

} // namespace
