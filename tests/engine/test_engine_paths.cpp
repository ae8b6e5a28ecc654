/* Every faster path against the plain reference, bit for bit, on seeded
 * random pictures of 1 to 40 pixels in each direction. Outputs start filled
 * with a sentinel and carry guard bytes, so unwritten or extra bytes show. */
#include <algorithm>
#include <array>
#include <functional>
#include <numeric>

#include "engine-test-util.h"
#include "ie-engine-private.h"

using namespace engine_test;

namespace {

struct Input { uint32_t w, h, to_w, to_h; Picture &src, &other; }; /* to_: the output's size */
using Fill = std::function<void(const Input &, uint8_t *out)>;
using Size = std::pair<uint32_t, uint32_t>;

struct Path {
	std::string name;
	Fill reference, candidate;
	uint32_t smallest_side = 1;
	Size (*to)(uint32_t w, uint32_t h) = nullptr; /* the output's size, if not the source's */
};

void sweep(const Path &path)
{
	for (uint32_t h = path.smallest_side; h <= 40; h++)
		for (uint32_t w = path.smallest_side; w <= 40; w++) {
			Picture src = random_picture(w, h, w * 41 + h), other = random_picture(w, h, w * 53 + h);
			const Size to = path.to ? path.to(w, h) : Size{w, h};
			const Input in{w, h, to.first, to.second, src, other};
			const size_t bytes = size_t(to.first) * to.second * 4;
			std::vector<uint8_t> want(bytes + kGuardBytes, kSentinel), got(want);
			path.reference(in, want.data());
			path.candidate(in, got.data());
			const std::string at = path.name + " " + std::to_string(w) + "x" + std::to_string(h) + " to " +
					       std::to_string(to.first) + "x" + std::to_string(to.second);
			ASSERT_EQ(std::count(got.begin() + bytes, got.end(), kSentinel), kGuardBytes) << at << ": wrote past the end";
			ASSERT_TRUE(want == got) << at;
		}
}

uint32_t *words(uint8_t *bytes) { return reinterpret_cast<uint32_t *>(bytes); }

const bool kAvx2 = __builtin_cpu_supports("avx2");

}

TEST(EnginePaths, FastPathsMatchTheirReference)
{
	std::vector<Path> paths;
	for (unsigned int rot : {1u, 3u}) {
		auto rotate = [rot](decltype(&iel_rotate32_tiled) fn) -> Fill {
			return [rot, fn](const Input &in, uint8_t *out) { fn(words(in.src.data()), words(out), in.w, in.h, rot); };
		};
		const Fill reference = [rot](const Input &in, uint8_t *out) { iel_rotate_reference(in.src.data(), out, in.w, in.h, 4, rot); };
		paths.push_back({"tiled rotation " + std::to_string(rot), reference, rotate(iel_rotate32_tiled)});
		if (kAvx2)
			paths.push_back({"avx2 rotation " + std::to_string(rot), reference, rotate(iel_rotate32_avx2)});
	}
	for (unsigned int o = 1; o <= 8; o++) {
		auto to = o >= 5 ? +[](uint32_t w, uint32_t h) { return Size{h, w}; } : nullptr;
		paths.push_back({"tiled orientation " + std::to_string(o),
				 [o](const Input &in, uint8_t *out) { iel_orient_reference(in.src.data(), out, in.w, in.h, 4, o); },
				 [o](const Input &in, uint8_t *out) { iel_orient32_tiled(words(in.src.data()), words(out), in.w, in.h, o); },
				 1, to});
		/* The routine itself, which hands the quarter turns to the rotation's paths. */
		paths.push_back({"orientation " + std::to_string(o),
				 [o](const Input &in, uint8_t *out) { iel_orient_reference(in.src.data(), out, in.w, in.h, 4, o); },
				 [o](const Input &in, uint8_t *out) {
					 IEL_Image dst = {0, 0, IEL_FORMAT_BGRA8888, out};
					 ASSERT_EQ(IEL_Orient_Image(&in.src.record, &dst, o), IEL_OK);
				 },
				 1, to});
	}
	auto resize = [](decltype(&iel_resize_reference) fn) -> Fill {
		return [fn](const Input &in, uint8_t *out) { fn(in.src.data(), in.w, in.h, out, in.to_w, in.to_h); };
	};
	for (auto to : {+[](uint32_t, uint32_t) { return Size{1, 1}; }, +[](uint32_t w, uint32_t h) { return Size{w, h}; },
			+[](uint32_t w, uint32_t h) { return Size{2 * w + 1, h / 2 + 1}; }, +[](uint32_t, uint32_t) { return Size{13, 7}; }}) {
		if (kAvx2)
			paths.push_back({"avx2 resize", resize(iel_resize_reference), resize(iel_resize_avx2), 2, to});
		if (__builtin_cpu_supports("avx512f"))
			paths.push_back({"avx512 resize", resize(iel_resize_reference), resize(iel_resize_avx512), 2, to});
	}
	/* Fed in strips of 1 to 3 rows, as a decoder hands them over. */
	auto reduce = [](int simd) -> Fill {
		return [simd](const Input &in, uint8_t *out) {
			IEL_Reducer *reducer = iel_reducer_new(in.w, in.h, in.to_w, in.to_h, out, simd);
			ASSERT_NE(reducer, nullptr);
			for (uint32_t y = 0, strip = 1; y < in.h; y += strip, strip = strip % 3 + 1)
				iel_reducer_push(reducer, in.src.data() + size_t(y) * in.w * 4, std::min(strip, in.h - y));
			iel_reducer_free(reducer);
		};
	};
	for (auto to : {+[](uint32_t, uint32_t) { return Size{1, 1}; }, +[](uint32_t w, uint32_t h) { return Size{w, h}; },
			+[](uint32_t w, uint32_t h) { return Size{(w + 1) / 2, (h + 2) / 3}; },
			+[](uint32_t w, uint32_t h) { return Size{(2 * w + 2) / 3, h}; },
			+[](uint32_t w, uint32_t h) { return Size{w, (3 * h + 3) / 4}; }}) {
		if (kAvx2)
			paths.push_back({"avx2 reduce", reduce(0), reduce(1), 1, to});
	}
	if (kAvx2) {
		for (uint8_t a : {0, 1, 127, 255}) {
			auto blend = [a](decltype(&iel_blend_reference) fn) -> Fill {
				return [a, fn](const Input &in, uint8_t *out) {
					std::memcpy(out, in.other.data(), in.other.size);
					fn(in.src.data(), out, in.src.size, a);
				};
			};
			paths.push_back({"blend " + std::to_string(a), blend(iel_blend_reference), blend(iel_blend_avx2)});
		}
		paths.push_back({"sepia", [](const Input &in, uint8_t *out) { iel_sepia_reference(in.src.data(), out, in.w * in.h, 4); },
				 [](const Input &in, uint8_t *out) { iel_sepia_avx2(in.src.data(), out, in.w * in.h); }});
		for (int n = 0; n <= 6; n++) {
			uint8_t table[256];
			iel_posterize_table(n, table);
			const std::vector<uint8_t> map(table, table + 256);
			paths.push_back({"posterise " + std::to_string(n),
					 [map](const Input &in, uint8_t *out) { iel_posterize_reference(in.src.data(), out, in.src.size, map.data()); },
					 [n](const Input &in, uint8_t *out) { iel_posterize_avx2(in.src.data(), out, in.src.size, n); }});
		}
		/* Level, column step, row step. */
		for (const auto &s : std::vector<std::array<unsigned int, 3>>{{0, 1, 1}, {1, 1, 1}, {2, 1, 1}, {3, 1, 1}, {4, 1, 1},
									       {4, 3, 2}, {1, 2, 5}, {4, 10, 10}}) {
			/* Each path gets its own sum planes, filled with junk: a sum
			 * read before it is written shows. */
			auto blur = [s](decltype(&iel_blur_reference) fn) -> Fill {
				return [s, fn](const Input &in, uint8_t *out) {
					const unsigned int radius = iel_blur_radius(s[0]);
					std::vector<int32_t> planes(s[2] * (in.w + 3 * radius * s[1]) * 4, 0x01234567);
					fn(in.src.data(), out, in.w, in.h, planes.data(), radius, s[1], s[2]);
				};
			};
			paths.push_back({"blur " + std::to_string(s[0]) + "," + std::to_string(s[1]) + "," + std::to_string(s[2]),
					 blur(iel_blur_reference), blur(iel_blur_avx2)});
		}
	}
	for (const Path &path : paths)
		sweep(path);
}

/* Every blue, green and red combination once, with varied alpha. */
TEST(EnginePaths, SepiaEveryColour)
{
	std::vector<uint32_t> src(1u << 24), want(src.size()), got(src.size());
	for (uint32_t c = 0; c < src.size(); c++)
		src[c] = c | (c * 7u) << 24;
	auto bytes = [](std::vector<uint32_t> &v) { return reinterpret_cast<uint8_t *>(v.data()); };
	iel_sepia_reference(bytes(src), bytes(want), src.size(), 4);
	iel_sepia_fast(bytes(src), bytes(got), src.size(), 4);
	EXPECT_TRUE(want == got);
}

/* The wrappers' conversions for every pixel count up to a few vector steps
 * and a long odd one: the vector loops stop short of the end and the plain
 * loop finishes, neither reading nor writing past the last pixel (the
 * sanitizer build sees a read; the guard bytes a write). */
TEST(EnginePaths, RgbConversionsMatchTheirReference)
{
	if (!kAvx2)
		GTEST_SKIP() << "no AVX2 on this processor";
	std::vector<size_t> counts(41);
	std::iota(counts.begin(), counts.end(), 0);
	counts.push_back(1001);
	for (size_t count : counts) {
		const Picture bgra = random_picture(static_cast<uint32_t>(count), 1, static_cast<uint32_t>(count) + 1);
		const std::vector<uint8_t> rgb_in(bgra.bytes.begin(), bgra.bytes.begin() + count * 3);
		std::vector<uint8_t> want(count * 3 + kGuardBytes, kSentinel), got(want);
		iel_bgra_to_rgb_reference(bgra.bytes.data(), want.data(), count);
		iel_bgra_to_rgb_avx2(std::vector<uint8_t>(bgra.bytes.begin(), bgra.bytes.begin() + count * 4).data(), got.data(), count);
		ASSERT_TRUE(want == got) << "to RGB, " << count << " pixels";
		want.assign(count * 4 + kGuardBytes, kSentinel), got = want;
		iel_rgb_to_opaque_bgra_reference(rgb_in.data(), want.data(), count);
		iel_rgb_to_opaque_bgra_avx2(rgb_in.data(), got.data(), count);
		ASSERT_TRUE(want == got) << "to BGRA, " << count << " pixels";
	}
}
