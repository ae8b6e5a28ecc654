/* Every effect's vector path against its plain reference, byte for byte, on
 * seeded random pictures from 1 x 1 up, odd widths included, and on sizes
 * long enough in one direction to take the wide-blur branches. Outputs start
 * filled with a sentinel and carry guard bytes, so unwritten or extra bytes
 * show. */
#include <random>

#include "effect-kit.h"
#include "effects-test-util.h"

namespace effects_test {
namespace {

constexpr uint8_t kSentinel = 0xA5;
constexpr size_t kGuard = 64;

/* Pins a path for the scope. */
struct Pinned {
	explicit Pinned(kit::Path path) { kit::path_pin() = {true, path}; }
	~Pinned() { kit::path_pin() = {}; }
};

Bytes random_picture(int width, int height, uint32_t seed)
{
	std::mt19937 rng(seed);
	Bytes px(size_t(width) * size_t(height) * 4);
	for (uint8_t &b : px)
		b = uint8_t(rng());
	return px;
}

Bytes run_on(kit::Path path, const Effect &effect, const Bytes &in, int width, int height)
{
	Pinned pinned(path);
	Bytes out(in.size() + kGuard, kSentinel);
	EXPECT_EQ(effect(in.data(), out.data(), width, height), 0);
	return out;
}

std::vector<NamedEffect> effects_and_levels()
{
	std::vector<NamedEffect> all = all_effects();
	/* Levels other than the editor's take other branches of the same code. */
	all.push_back({"Greyscale5", [](const uint8_t *i, uint8_t *o, int w, int h) { return controlGreyscale(i, o, w, h, 5); }, true});
	all.push_back({"FadedColours0", [](const uint8_t *i, uint8_t *o, int w, int h) { return controlFadedColour(i, o, w, h, 0); }, true});
	all.push_back({"SoftGlow30", [](const uint8_t *i, uint8_t *o, int w, int h) { return applySoftglow(i, o, w, h, 30); }, false});
	all.push_back({"Sharpen1", [](const uint8_t *i, uint8_t *o, int w, int h) { return mi_apply_sharpen_all(i, o, w, h, 1); }, false});
	for (int option : {1, 3}) {
		const std::string weight = std::to_string(option);
		all.push_back({"Sketch" + weight, [option](const uint8_t *i, uint8_t *o, int w, int h) {
				       return apply_engine(IEL_EFFECT_ID_SKETCH, option, i, o, w, h);
			       }, false});
		all.push_back({"Cartoon" + weight, [option](const uint8_t *i, uint8_t *o, int w, int h) {
				       return apply_engine(IEL_EFFECT_ID_CARTOON, option, i, o, w, h);
			       }, false});
	}
	return all;
}

class EffectPaths : public ::testing::TestWithParam<NamedEffect> {};

TEST_P(EffectPaths, VectorPathMatchesTheReference)
{
	if (!__builtin_cpu_supports("avx2"))
		GTEST_SKIP() << "no AVX2 on this processor";
	const NamedEffect &e = GetParam();
	std::vector<std::pair<int, int>> sizes;
	for (int side : {1, 2, 3, 7, 8, 9, 15, 16, 17, 33})
		sizes.insert(sizes.end(), {{side, 1}, {1, side}, {side, side}, {side + 2, 5}});
	/* Long thin pictures: a large extent takes the shrunk blurs and the
	 * half-size grids at little cost, and the widest blurs, which read
	 * the whole picture before the first row is drawn. */
	sizes.insert(sizes.end(), {{160, 120}, {157, 31}, {700, 9}, {9, 701}, {1283, 6}, {1601, 3}, {2, 1933}, {5131, 2}});
	for (auto [w, h] : sizes) {
		const Bytes in = random_picture(w, h, uint32_t(w * 7919 + h));
		const Bytes want = run_on(kit::Path::REFERENCE, e.run, in, w, h);
		const Bytes got = run_on(kit::Path::AVX2, e.run, in, w, h);
		const std::string at = e.name + " " + std::to_string(w) + "x" + std::to_string(h);
		ASSERT_TRUE(Bytes(got.end() - long(kGuard), got.end()) == Bytes(kGuard, kSentinel)) << at << ": wrote past the end";
		size_t first = 0;
		while (first < in.size() && want[first] == got[first])
			++first;
		ASSERT_EQ(first, in.size()) << at << ": first difference at byte " << first << " (pixel " << first / 4 << ")";
	}
}

INSTANTIATE_TEST_SUITE_P(Effects, EffectPaths, ::testing::ValuesIn(effects_and_levels()),
			 [](const ::testing::TestParamInfo<NamedEffect> &info) { return info.param.name; });

} // namespace
} // namespace effects_test
