/* Each effect does what its name promises, measured on the picture. */
#include "effects-test-util.h"

namespace effects_test {
namespace {

constexpr int kW = 160;
constexpr int kH = 120;

TEST(Greyscale, FullLevelGivesEqualChannelsFollowingBrightness)
{
	const Bytes in = photo(kW, kH);
	const Bytes out = run(effect("Greyscale"), in, kW, kH);
	for (size_t i = 0; i < out.size(); i += 4) {
		ASSERT_EQ(out[i], out[i + 1]);
		ASSERT_EQ(out[i + 1], out[i + 2]);
		ASSERT_NEAR(out[i], luma_at(in, i / 4), 2.0);
	}
}

TEST(Levels, LevelZeroKeepsThePictureAndOutOfRangeIsRefused)
{
	const Bytes in = photo(kW, kH);
	struct Levelled {
		const char *name;
		int (*run)(const unsigned char *, unsigned char *, int, int, int);
		int highest;
	};
	const Levelled levelled[] = {{"greyscale", controlGreyscale, 10},
				     {"faded", controlFadedColour, 100},
				     {"soft glow", applySoftglow, 100},
				     {"sharpen", mi_apply_sharpen_all, 10}};
	for (const Levelled &l : levelled) {
		Bytes out(in.size(), 0);
		ASSERT_EQ(l.run(in.data(), out.data(), kW, kH, 0), 0) << l.name;
		EXPECT_LT(mean_difference(in, out), 0.6) << l.name << " at level 0";
		/* Higher levels go further from the picture. */
		Bytes half(in.size(), 0), full(in.size(), 0);
		ASSERT_EQ(l.run(in.data(), half.data(), kW, kH, l.highest / 2), 0) << l.name;
		ASSERT_EQ(l.run(in.data(), full.data(), kW, kH, l.highest), 0) << l.name;
		EXPECT_LT(mean_difference(in, half), mean_difference(in, full)) << l.name;
		Bytes untouched(in.size(), 0x11);
		EXPECT_NE(l.run(in.data(), untouched.data(), kW, kH, -1), 0) << l.name;
		EXPECT_NE(l.run(in.data(), untouched.data(), kW, kH, l.highest + 1), 0) << l.name;
		EXPECT_TRUE(untouched == Bytes(in.size(), 0x11)) << l.name;
	}
}

TEST(Negative, AppliedTwiceGivesThePictureBack)
{
	const Bytes in = photo(kW, kH);
	const Bytes once = run(effect("Negative"), in, kW, kH);
	EXPECT_EQ(once[0], 255 - in[0]);
	EXPECT_TRUE(run(effect("Negative"), once, kW, kH) == in);
}

TEST(Sharpness, SharpenRaisesEdgeEnergyAndSoftGlowLowersIt)
{
	const Bytes in = photo(kW, kH);
	const double original = edge_energy(in, kW, kH);
	EXPECT_GT(edge_energy(run(effect("Sharpen"), in, kW, kH), kW, kH), original * 1.2);
	EXPECT_LT(edge_energy(run(effect("SoftGlow"), in, kW, kH), kW, kH), original * 0.8);
}

TEST(SoftGlow, BrightensAroundHighlights)
{
	const Bytes in = photo(kW, kH);
	const Bytes out = run(effect("SoftGlow"), in, kW, kH);
	/* Just outside the sun's disc the glow spills over the sky. */
	size_t beside_sun = size_t(kH / 5) * kW + size_t(kW * 0.75 + kW * 0.1);
	EXPECT_GT(luma_at(out, beside_sun), luma_at(in, beside_sun) + 8);
}

TEST(Sketch, IsMostlyLightPaperWithDarkStrokesAlongEdges)
{
	/* A dark square on a light ground. */
	Bytes in(size_t(kW) * kH * 4);
	for (int y = 0; y < kH; ++y)
		for (int x = 0; x < kW; ++x) {
			bool inside = x >= 50 && x < 110 && y >= 30 && y < 90;
			uint8_t v = uint8_t((inside ? 60 : 205) + mix(uint32_t(x), uint32_t(y)) % 5);
			uint8_t *p = &in[(size_t(y) * kW + size_t(x)) * 4];
			p[0] = p[1] = p[2] = v;
			p[3] = 255;
		}
	const Bytes out = run(effect("Sketch"), in, kW, kH);
	EXPECT_GT(mean_luma(out), 170.0);
	auto mean_over = [&](auto &&where) {
		double sum = 0;
		int n = 0;
		for (int y = 0; y < kH; ++y)
			for (int x = 0; x < kW; ++x)
				if (where(x, y)) {
					sum += luma_at(out, size_t(y) * kW + size_t(x));
					++n;
				}
		return sum / n;
	};
	double on_edge = mean_over([](int x, int y) {
		bool near_x = std::abs(x - 50) <= 2 || std::abs(x - 109) <= 2;
		bool near_y = std::abs(y - 30) <= 2 || std::abs(y - 89) <= 2;
		return (near_x && y > 32 && y < 88) || (near_y && x > 52 && x < 108);
	});
	double open_paper = mean_over([](int x, int y) { return x < 30 || x > 130 || y < 12 || y > 108; });
	EXPECT_GT(open_paper, 220.0);
	EXPECT_LT(on_edge, open_paper - 40.0);
}

TEST(Flattening, CartoonAndPopArtUseFarFewerColours)
{
	const Bytes in = photo(kW, kH);
	const size_t original = distinct_colours(in);
	EXPECT_LT(distinct_colours(run(effect("Cartoon"), in, kW, kH)), original / 4);
	EXPECT_LT(distinct_colours(run(effect("PopArt"), in, kW, kH)), original / 4);
}

TEST(Cartoon, InksTheOutlines)
{
	const Bytes in = photo(kW, kH);
	const Bytes out = run(effect("Cartoon"), in, kW, kH);
	/* The house's left wall is a hard edge against the grass and sky. */
	float darkest = 255.f;
	for (int x = int(kW * 0.2f) - 3; x <= int(kW * 0.2f) + 3; ++x)
		darkest = std::min(darkest, luma_at(out, size_t(kH / 2) * kW + size_t(x)));
	EXPECT_LT(darkest, 40.f);
}

TEST(MagicPen, DrawsBrightLinesOnADarkGround)
{
	const Bytes in = photo(kW, kH);
	const Bytes out = run(effect("MagicPen"), in, kW, kH);
	EXPECT_LT(mean_luma(out), mean_luma(in) * 0.6);
	float brightest_on_wall = 0.f;
	for (int x = int(kW * 0.2f) - 3; x <= int(kW * 0.2f) + 3; ++x)
		brightest_on_wall = std::max(brightest_on_wall, luma_at(out, size_t(kH / 2) * kW + size_t(x)));
	EXPECT_GT(brightest_on_wall, 150.f);
}

TEST(ToneLooks, AreClearlyDistinctFromEachOther)
{
	const Bytes in = photo(kW, kH);
	std::vector<std::pair<std::string, Bytes>> results;
	for (const NamedEffect &e : all_effects())
		if (e.tone)
			results.emplace_back(e.name, run(e, in, kW, kH));
	for (size_t a = 0; a < results.size(); ++a)
		for (size_t b = a + 1; b < results.size(); ++b)
			EXPECT_GT(mean_difference(results[a].second, results[b].second), 8.0)
				<< results[a].first << " looks like " << results[b].first;
}

TEST(OldPhoto, IsBrownMonochromeWithDarkCorners)
{
	const Bytes in = photo(kW, kH);
	const Bytes out = run(effect("OldPhoto"), in, kW, kH);
	const size_t centre = size_t(kH / 2) * kW + kW / 2 + 10;
	const uint8_t *p = &out[centre * 4];
	EXPECT_GT(p[2], p[1]);
	EXPECT_GT(p[1], p[0]);
	double corner = 0, middle = 0;
	for (int y = 0; y < 6; ++y)
		for (int x = 0; x < 6; ++x) {
			corner += luma_at(out, size_t(y) * kW + size_t(x));
			middle += luma_at(out, size_t(y + 6) * kW + size_t(x + kW / 2 - 3));
		}
	EXPECT_LT(corner, middle * 0.8);
}

} // namespace
} // namespace effects_test
