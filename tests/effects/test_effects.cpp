/* What every effect owes the editor (a visible, opaque, non-blank change,
 * the same bytes whatever the output held before, safety on tiny pictures
 * and unusable arguments), then what each one's name promises. */
#include "effects-test-util.h"

namespace effects_test {
namespace {

constexpr int kW = 160;
constexpr int kH = 120;

class EveryEffect : public ::testing::TestWithParam<NamedEffect> {};

TEST_P(EveryEffect, ChangesAPhotoDeterministicallyIntoAnOpaqueNonBlankPicture)
{
	const NamedEffect &e = GetParam();
	const Bytes in = photo(kW, kH);
	const Bytes out = run(e, in, kW, kH);
	EXPECT_GT(mean_difference(in, out), 4.0) << "barely changed the picture";
	size_t opaque = 0, non_zero = 0;
	for (size_t i = 0; i < out.size(); i += 4) {
		opaque += out[i + 3] == 255;
		non_zero += out[i] || out[i + 1] || out[i + 2];
	}
	EXPECT_EQ(opaque, out.size() / 4);
	EXPECT_GT(non_zero, out.size() / 8) << "mostly black";

	Bytes stale(in.size(), 0xa7);
	ASSERT_EQ(e.run(in.data(), stale.data(), kW, kH), 0);
	EXPECT_TRUE(out == stale);
	EXPECT_TRUE(in == photo(kW, kH)) << "changed its input";
}

TEST_P(EveryEffect, HandlesTinyPicturesAndRefusesUnusableArguments)
{
	const NamedEffect &e = GetParam();
	for (auto [w, h] : std::initializer_list<std::pair<int, int>>{{1, 1}, {1, 9}, {9, 1}, {2, 2}, {3, 200}, {200, 3}}) {
		const Bytes in = photo(w, h);
		/* Guard bytes after the pixels catch a write past the end. */
		Bytes out(in.size() + 64, 0x5a);
		ASSERT_EQ(e.run(in.data(), out.data(), w, h), 0) << w << "x" << h;
		for (size_t i = 0; i < in.size(); i += 4)
			ASSERT_EQ(out[i + 3], 255) << w << "x" << h;
		EXPECT_TRUE(Bytes(out.begin() + long(in.size()), out.end()) == Bytes(64, 0x5a)) << w << "x" << h;
	}

	const Bytes in = photo(4, 4);
	Bytes out(in.size(), 0x33);
	EXPECT_NE(e.run(nullptr, out.data(), 4, 4), 0);
	EXPECT_NE(e.run(in.data(), nullptr, 4, 4), 0);
	EXPECT_NE(e.run(in.data(), out.data(), 0, 4), 0);
	EXPECT_NE(e.run(in.data(), out.data(), 4, -1), 0);
	/* A size whose byte count overflows must not be taken at its word. */
	EXPECT_NE(e.run(in.data(), out.data(), 1 << 20, 1 << 20), 0);
	EXPECT_TRUE(out == Bytes(in.size(), 0x33));
}

INSTANTIATE_TEST_SUITE_P(Effects, EveryEffect, ::testing::ValuesIn(all_effects()),
			 [](const ::testing::TestParamInfo<NamedEffect> &info) { return info.param.name; });

TEST(EffectCharacter, GreyscaleGivesEqualChannelsFollowingBrightness)
{
	const Bytes in = photo(kW, kH);
	const Bytes out = run(effect("Greyscale"), in, kW, kH);
	for (size_t i = 0; i < out.size(); i += 4) {
		ASSERT_EQ(out[i], out[i + 1]);
		ASSERT_EQ(out[i + 1], out[i + 2]);
		ASSERT_NEAR(out[i], luma_at(in, i / 4), 2.0);
	}
}

TEST(EffectCharacter, LevelZeroKeepsThePictureHigherGoesFurtherOutOfRangeIsRefused)
{
	const Bytes in = photo(kW, kH);
	struct Levelled {
		const char *name;
		int (*run)(const unsigned char *, unsigned char *, int, int, int);
		int highest;
	};
	for (const Levelled &l : {Levelled{"greyscale", controlGreyscale, 10}, Levelled{"faded", controlFadedColour, 100},
				  Levelled{"soft glow", applySoftglow, 100}, Levelled{"sharpen", mi_apply_sharpen_all, 10}}) {
		Bytes none(in.size(), 0), half(in.size(), 0), full(in.size(), 0), untouched(in.size(), 0x11);
		ASSERT_EQ(l.run(in.data(), none.data(), kW, kH, 0), 0) << l.name;
		ASSERT_EQ(l.run(in.data(), half.data(), kW, kH, l.highest / 2), 0) << l.name;
		ASSERT_EQ(l.run(in.data(), full.data(), kW, kH, l.highest), 0) << l.name;
		EXPECT_LT(mean_difference(in, none), 0.6) << l.name;
		EXPECT_LT(mean_difference(in, half), mean_difference(in, full)) << l.name;
		EXPECT_NE(l.run(in.data(), untouched.data(), kW, kH, -1), 0) << l.name;
		EXPECT_NE(l.run(in.data(), untouched.data(), kW, kH, l.highest + 1), 0) << l.name;
		EXPECT_TRUE(untouched == Bytes(in.size(), 0x11)) << l.name;
	}
}

TEST(EffectCharacter, NegativeAppliedTwiceGivesThePictureBack)
{
	const Bytes in = photo(kW, kH);
	const Bytes once = run(effect("Negative"), in, kW, kH);
	EXPECT_EQ(once[0], 255 - in[0]);
	EXPECT_TRUE(run(effect("Negative"), once, kW, kH) == in);
}

TEST(EffectCharacter, SharpenRaisesEdgeEnergySoftGlowLowersItAndGlows)
{
	const Bytes in = photo(kW, kH);
	const Bytes glow = run(effect("SoftGlow"), in, kW, kH);
	const double original = edge_energy(in, kW, kH);
	EXPECT_GT(edge_energy(run(effect("Sharpen"), in, kW, kH), kW, kH), original * 1.2);
	EXPECT_LT(edge_energy(glow, kW, kH), original * 0.8);
	/* Just outside the sun's disc the glow spills over the sky. */
	size_t beside_sun = size_t(kH / 5) * kW + size_t(kW * 0.85);
	EXPECT_GT(luma_at(glow, beside_sun), luma_at(in, beside_sun) + 8);
}

TEST(EffectCharacter, SketchIsMostlyLightPaperWithDarkStrokesAlongEdges)
{
	/* A dark square, 50..109 by 30..89, on a light ground. */
	Bytes in(size_t(kW) * kH * 4, 255);
	for (size_t i = 0; i < in.size() / 4; ++i) {
		int x = int(i % kW), y = int(i / kW);
		bool inside = x >= 50 && x < 110 && y >= 30 && y < 90;
		in[i * 4] = in[i * 4 + 1] = in[i * 4 + 2] = uint8_t((inside ? 60 : 205) + mix(uint32_t(x), uint32_t(y)) % 5);
	}
	const Bytes out = run(effect("Sketch"), in, kW, kH);
	double edge = 0, open = 0;
	int edges = 0, opens = 0;
	for (size_t i = 0; i < out.size() / 4; ++i) {
		int x = int(i % kW), y = int(i / kW);
		if ((std::abs(x - 50) <= 2 || std::abs(x - 109) <= 2) && y > 32 && y < 88)
			edge += luma_at(out, i), ++edges;
		else if (x < 30 || x > 130 || y < 12 || y > 108)
			open += luma_at(out, i), ++opens;
	}
	EXPECT_GT(mean_luma(out), 170.0);
	EXPECT_GT(open / opens, 220.0);
	EXPECT_LT(edge / edges, open / opens - 40.0);
}

TEST(EffectCharacter, CartoonAndPopArtFlattenColoursOutlinesAreInkedOrPenned)
{
	const Bytes in = photo(kW, kH);
	const Bytes cartoon = run(effect("Cartoon"), in, kW, kH), pen = run(effect("MagicPen"), in, kW, kH);
	const size_t original = distinct_colours(in);
	EXPECT_LT(distinct_colours(cartoon), original / 4);
	EXPECT_LT(distinct_colours(run(effect("PopArt"), in, kW, kH)), original / 4);
	/* Across the house's left wall, a hard edge against the grass and sky:
	 * cartoon inks it dark, magic pen draws it bright on a dark ground. */
	float darkest = 255.f, brightest = 0.f;
	for (int x = int(kW * 0.2f) - 3; x <= int(kW * 0.2f) + 3; ++x) {
		darkest = std::min(darkest, luma_at(cartoon, size_t(kH / 2) * kW + size_t(x)));
		brightest = std::max(brightest, luma_at(pen, size_t(kH / 2) * kW + size_t(x)));
	}
	EXPECT_LT(darkest, 40.f);
	EXPECT_GT(brightest, 150.f);
	EXPECT_LT(mean_luma(pen), mean_luma(in) * 0.6);
}

TEST(EffectCharacter, ToneLooksAreClearlyDistinctFromEachOther)
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

TEST(EffectCharacter, OldPhotoIsBrown)
{
	const Bytes out = run(effect("OldPhoto"), photo(kW, kH), kW, kH);
	const uint8_t *centre = &out[(size_t(kH / 2) * kW + kW / 2 + 10) * 4];
	EXPECT_GT(centre[2], centre[1]);
	EXPECT_GT(centre[1], centre[0]);
}

} // namespace
} // namespace effects_test
