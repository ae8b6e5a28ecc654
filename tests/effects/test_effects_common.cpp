/* What every effect owes the editor, whatever it draws: a visible change
 * that is never a blank picture, an opaque result, the same bytes for the
 * same picture, no dependence on the output's old content, and safety on
 * the smallest and thinnest pictures. */
#include "effects-test-util.h"

namespace effects_test {
namespace {

constexpr int kW = 160;
constexpr int kH = 120;

class EveryEffect : public ::testing::TestWithParam<NamedEffect> {};

TEST_P(EveryEffect, ChangesAPhotoIntoAnOpaqueNonBlankPicture)
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
}

TEST_P(EveryEffect, IsDeterministicAndWritesEveryPixel)
{
	const NamedEffect &e = GetParam();
	const Bytes in = photo(kW, kH);
	const Bytes first = run(e, in, kW, kH);
	/* A stale output buffer must not leak into the result. */
	Bytes stale(in.size(), 0xa7);
	ASSERT_EQ(e.run(in.data(), stale.data(), kW, kH), 0);
	EXPECT_TRUE(first == stale);
	/* The input stays as it was. */
	EXPECT_TRUE(in == photo(kW, kH));
}

TEST_P(EveryEffect, HandlesTinyAndThinPictures)
{
	const NamedEffect &e = GetParam();
	const int sizes[][2] = {{1, 1}, {1, 9}, {9, 1}, {2, 2}, {3, 200}, {200, 3}};
	for (const auto &size : sizes) {
		const int w = size[0], h = size[1];
		const Bytes in = photo(w, h);
		/* Guard bytes after the pixels catch a write past the end. */
		Bytes out(in.size() + 64, 0x5a);
		ASSERT_EQ(e.run(in.data(), out.data(), w, h), 0) << w << "x" << h;
		for (size_t i = 0; i < in.size(); i += 4)
			ASSERT_EQ(out[i + 3], 255) << w << "x" << h;
		for (size_t i = in.size(); i < out.size(); ++i)
			ASSERT_EQ(out[i], 0x5a) << "wrote past the picture at " << w << "x" << h;
	}
}

TEST_P(EveryEffect, RefusesUnusableArgumentsWithoutWriting)
{
	const NamedEffect &e = GetParam();
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

} // namespace
} // namespace effects_test
