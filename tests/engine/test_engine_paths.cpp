/* Every faster path against the plain reference, bit for bit, on seeded
 * random pictures of 1 to 40 pixels in each direction. Outputs start filled
 * with a sentinel and carry guard bytes, so unwritten or extra bytes show. */
#include <algorithm>
#include <functional>
#include <string>

#include "engine-test-util.h"
#include "ie-engine-private.h"

using namespace engine_test;

namespace {

using Fill = std::function<void(uint8_t *out)>;

void expect_same(size_t bytes, const Fill &reference, const Fill &candidate, const std::string &label)
{
	std::vector<uint8_t> want(bytes + kGuardBytes, kSentinel), got(want);
	reference(want.data());
	candidate(got.data());
	ASSERT_EQ(std::count(got.begin() + bytes, got.end(), kSentinel), kGuardBytes) << label << ": wrote past the end";
	ASSERT_TRUE(want == got) << label;
}

template <class Body>
void for_each_size(Body body)
{
	for (uint32_t height = 1; height <= 40; height++)
		for (uint32_t width = 1; width <= 40; width++)
			body(width, height, std::to_string(width) + "x" + std::to_string(height));
}

const bool kAvx2 = __builtin_cpu_supports("avx2");
const bool kAvx512 = __builtin_cpu_supports("avx512f");

}

TEST(EnginePaths, Rotation)
{
	for_each_size([](uint32_t w, uint32_t h, const std::string &size) {
		Picture src = random_picture(w, h, w * 41 + h);
		const auto *words = reinterpret_cast<const uint32_t *>(src.data());
		for (unsigned int rot : {1u, 3u}) {
			const std::string label = size + " rotation " + std::to_string(rot);
			const Fill reference = [&](uint8_t *out) { iel_rotate_reference(src.data(), out, w, h, 4, rot); };
			expect_same(src.size, reference, [&](uint8_t *out) {
				iel_rotate32_tiled(words, reinterpret_cast<uint32_t *>(out), w, h, rot);
			}, "tiled " + label);
			if (kAvx2)
				expect_same(src.size, reference, [&](uint8_t *out) {
					iel_rotate32_avx2(words, reinterpret_cast<uint32_t *>(out), w, h, rot);
				}, "avx2 " + label);
			expect_same(src.size, reference, [&](uint8_t *out) {
				IEL_Image dst = {0, 0, IEL_FORMAT_BGRA8888, out};
				ASSERT_EQ(IEL_Rotate_Image(&src.record, &dst, rot), IEL_OK);
			}, "IEL_Rotate_Image " + label);
		}
	});
}

TEST(EnginePaths, Resize)
{
	for_each_size([](uint32_t w, uint32_t h, const std::string &size) {
		Picture src = random_picture(w, h, w * 43 + h);
		for (const auto &to : {std::pair<uint32_t, uint32_t>{1, 1}, {w, h}, {2 * w + 1, h / 2 + 1}, {13, 7}}) {
			const std::string label = size + " to " + std::to_string(to.first) + "x" + std::to_string(to.second);
			const size_t bytes = to.first * to.second * 4;
			const Fill reference = [&](uint8_t *out) {
				iel_resize_reference(src.data(), w, h, out, to.first, to.second);
			};
			if (kAvx2 && w >= 2 && h >= 2)
				expect_same(bytes, reference, [&](uint8_t *out) {
					iel_resize_avx2(src.data(), w, h, out, to.first, to.second);
				}, "avx2 " + label);
			if (kAvx512 && w >= 2 && h >= 2)
				expect_same(bytes, reference, [&](uint8_t *out) {
					iel_resize_avx512(src.data(), w, h, out, to.first, to.second);
				}, "avx512 " + label);
			expect_same(bytes, reference, [&](uint8_t *out) {
				IEL_Image dst = {to.first, to.second, IEL_FORMAT_BGRA8888, out};
				ASSERT_EQ(IEL_Resize_Image(&src.record, &dst), IEL_OK);
			}, "IEL_Resize_Image " + label);
		}
	});
}

TEST(EnginePaths, BlendSepiaPosterize)
{
	if (!kAvx2)
		GTEST_SKIP() << "no AVX2 on this processor";
	for_each_size([](uint32_t w, uint32_t h, const std::string &size) {
		Picture src = random_picture(w, h, w * 47 + h), other = random_picture(w, h, w * 53 + h);
		for (uint8_t a : {0, 1, 127, 255}) {
			auto blend = [&](void (*fn)(const uint8_t *, uint8_t *, size_t, uint8_t)) {
				return [&, fn](uint8_t *out) {
					std::memcpy(out, other.data(), other.size);
					fn(src.data(), out, src.size, a);
				};
			};
			expect_same(src.size, blend(iel_blend_reference), blend(iel_blend_avx2), size + " blend " + std::to_string(a));
		}
		expect_same(src.size, [&](uint8_t *out) { iel_sepia_reference(src.data(), out, w * h, 4); },
			    [&](uint8_t *out) { iel_sepia_avx2(src.data(), out, w * h); }, size + " sepia");
		for (int strength = 0; strength <= 6; strength++) {
			uint8_t table[256];
			iel_posterize_table(strength, table);
			expect_same(src.size, [&](uint8_t *out) { iel_posterize_reference(src.data(), out, src.size, table); },
				    [&](uint8_t *out) { iel_posterize_avx2(src.data(), out, src.size, strength); },
				    size + " posterise " + std::to_string(strength));
		}
	});
}

/* Every blue, green and red combination once. */
TEST(EnginePaths, SepiaEveryColour)
{
	if (!kAvx2)
		GTEST_SKIP() << "no AVX2 on this processor";
	constexpr uint32_t kColours = 1u << 24;
	std::vector<uint8_t> src(kColours * 4);
	for (uint32_t c = 0; c < kColours; c++) {
		const uint32_t pixel = c | (c * 7u) << 24;
		std::memcpy(&src[c * 4], &pixel, 4);
	}
	expect_same(src.size(), [&](uint8_t *out) { iel_sepia_reference(src.data(), out, kColours, 4); },
		    [&](uint8_t *out) { iel_sepia_avx2(src.data(), out, kColours); }, "every colour");
}

TEST(EnginePaths, Blur)
{
	if (!kAvx2)
		GTEST_SKIP() << "no AVX2 on this processor";
	struct Shape { unsigned int level, column_step, row_step; };
	const Shape shapes[] = {{0, 1, 1}, {1, 1, 1}, {2, 1, 1}, {3, 1, 1}, {4, 1, 1}, {4, 3, 2}, {1, 2, 5}, {4, 10, 10}};
	for_each_size([&](uint32_t w, uint32_t h, const std::string &size) {
		Picture src = random_picture(w, h, w * 59 + h);
		for (const Shape &s : shapes) {
			const unsigned int radius = iel_blur_radius(s.level);
			const size_t sums = s.row_step * (w + 3 * radius * s.column_step) * 4;
			/* Each path gets its own sum buffer, filled with junk: a
			 * sum read before it is written shows. */
			auto blur = [&](decltype(&iel_blur_reference) fn) {
				return [&, fn](uint8_t *out) {
					std::vector<int32_t> planes(sums, 0x01234567);
					fn(src.data(), out, w, h, planes.data(), radius, s.column_step, s.row_step);
				};
			};
			expect_same(src.size, blur(iel_blur_reference), blur(iel_blur_avx2),
				    size + " level " + std::to_string(s.level) + " steps " + std::to_string(s.column_step) +
					    "," + std::to_string(s.row_step));
		}
	});
}
