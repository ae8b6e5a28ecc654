/* Blending, blur, sepia and posterise: known results, the refusals with
 * their messages, and blur on pictures smaller than the kernel's reach. */
#include <algorithm>
#include <cmath>

#include "engine-test-util.h"
#include "ie-engine-private.h"

using namespace engine_test;

namespace {

/* Blurs exact-size pixels, so that the sanitizer sees any stray access. */
std::vector<uint8_t> blurred(std::vector<uint8_t> src, uint32_t w, uint32_t h, unsigned int level = 4, int column_step = 1,
			     int row_step = 1)
{
	std::vector<uint8_t> out(src.size());
	IEL_Image in = {w, h, IEL_FORMAT_BGRA8888, src.data()}, to = {w, h, IEL_FORMAT_BGRA8888, out.data()};
	IEL_RowSumBufInfo info = {nullptr, 0};
	EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(&in, &to, &info, level, column_step, row_step), IEL_OK);
	free(info.ps32Buf);
	return out;
}

}

TEST(EngineBlend, EndsOfTheRangeKeepAlphaAndOthersAreRefused)
{
	const std::vector<uint8_t> effect_bytes = {255, 1, 128, 77, 0, 200, 10, 99};
	const std::vector<uint8_t> unedited = {0, 255, 100, 11, 255, 1, 60, 22};
	Picture effect(2, 1), inout(2, 1);
	std::memcpy(effect.data(), effect_bytes.data(), 8);
	struct Case { float alpha; std::vector<uint8_t> result; };
	for (const Case &c : {Case{100.0f, {254, 0, 127, 11, 0, 199, 9, 22}}, Case{0.0f, {0, 254, 99, 11, 254, 0, 59, 22}},
			      Case{50.0f, {126, 127, 113, 11, 127, 99, 34, 22}}}) {
		std::memcpy(inout.data(), unedited.data(), 8);
		ASSERT_EQ(IEL_Alpha_blending(&effect.record, &inout.record, c.alpha), IEL_OK);
		EXPECT_TRUE(inout.pixels() == c.result && inout.guard_intact()) << c.alpha;
	}

	/* The alpha is checked before the records. */
	struct Refused { float alpha; int shown; };
	for (const Refused &c : {Refused{100.5f, 100}, Refused{-0.5f, 0}, Refused{NAN, 0}, Refused{1e20f, 2147483647}}) {
		platform_log_record_clear();
		EXPECT_EQ(IEL_Alpha_blending(nullptr, &inout.record, c.alpha), IEL_ERR_INVALID_PARAM);
		EXPECT_EQ(only_message(), "IEL_Alpha_blending Invalid  alpha val:" + std::to_string(c.shown) + " \n");
	}
	EXPECT_EQ(inout.pixels(), (std::vector<uint8_t>{126, 127, 113, 11, 127, 99, 34, 22}));
}

TEST(EngineBlur, UniformPicturesAndLevelsAboveFour)
{
	for (uint32_t size : {1u, 3u, 13u}) {
		EXPECT_EQ(blurred(std::vector<uint8_t>(size * size * 4, 255), size, size), std::vector<uint8_t>(size * size * 4, 254));
		EXPECT_EQ(blurred(std::vector<uint8_t>(size * size * 4, 0), size, size), std::vector<uint8_t>(size * size * 4, 0));
	}
	const std::vector<uint8_t> src = random_picture(23, 17, 4).pixels();
	EXPECT_EQ(blurred(src, 23, 17, 4), blurred(src, 23, 17, 9));
}

/* The running sums against a direct sum of the K x K samples under the edge
 * rule (rows above the picture count as the first row of the same phase,
 * rows below as the last row, columns outside as the nearest column), on
 * pictures down to 1 x 1, narrower than the kernel's reach and lower than
 * the row step. */
TEST(EngineBlur, MatchesDirectSumsOnSmallPictures)
{
	struct Shape { unsigned int level; int column_step, row_step; };
	for (const Shape &s : {Shape{4, 1, 1}, Shape{0, 1, 1}, Shape{2, 3, 2}, Shape{4, 10, 10}, Shape{1, 7, 3}}) {
		const int r = static_cast<int>(iel_blur_radius(s.level)), recip = (1 << 18) / ((2 * r + 1) * (2 * r + 1));
		for (int h = 1; h <= 12; h++)
			for (int w = 1; w <= 12; w++) {
				const std::vector<uint8_t> src = random_picture(w, h, w * 13 + h).pixels();
				const std::vector<uint8_t> out = blurred(src, w, h, s.level, s.column_step, s.row_step);
				for (int i = 0; i < w * h * 4; i++) {
					const int x = i / 4 % w, y = i / 4 / w, c = i % 4;
					int total = 0;
					for (int u = -r; u <= r; u++)
						for (int t = -r; t <= r; t++) {
							const int row = std::min(y + u * s.row_step < 0 ? y % s.row_step : y + u * s.row_step, h - 1);
							total += src[(row * w + std::clamp(x + t * s.column_step, 0, w - 1)) * 4 + c];
						}
					ASSERT_EQ(out[i], (total * recip) >> 18) << w << "x" << h << " level " << s.level << " at " << x << "," << y;
				}
			}
	}
}

/* A step of 0 would divide by zero and the window tables hold 10 phases. */
TEST(EngineBlur, RefusalsWithTheirMessages)
{
	Picture src = random_picture(8, 8, 5), out(8, 8);
	IEL_RowSumBufInfo info = {nullptr, 0}, sized_but_empty = {nullptr, 1 << 20};
	IEL_Image rgb = {8, 8, IEL_FORMAT_RGB888, src.data()};
	struct Case { const IEL_Image *src; IEL_RowSumBufInfo *info; int column_step, row_step, result; std::string message; };
	for (const Case &c : {Case{&rgb, &info, 1, 1, IEL_ERR_UNSUPPORTED_FORMAT, "Only BGRA888 is supported \n"},
			      Case{&src.record, nullptr, 1, 1, IEL_ERR_INVALID_PARAM, "Null One row sum buffer info \n"},
			      Case{&src.record, &info, 0, 1, IEL_ERR_INVALID_PARAM, "Invalid skip step:0,1 \n"},
			      Case{&src.record, &info, 1, 11, IEL_ERR_INVALID_PARAM, "Invalid skip step:1,11 \n"},
			      Case{&src.record, &sized_but_empty, 1, 1, IEL_ERR_ALLOC, "Failed to allocate ps32SumRowR \n"}}) {
		platform_log_record_clear();
		EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(c.src, &out.record, c.info, 4, c.column_step, c.row_step), c.result);
		EXPECT_EQ(only_message(), c.message);
	}
	EXPECT_TRUE(out.untouched() && info.ps32Buf == nullptr);
}

/* The caller's buffer is kept while large enough and renewed when the width
 * or the row step grows, so a larger step never overruns it. */
TEST(EngineBlur, ReusesAndRenewsTheRowSumBuffer)
{
	IEL_RowSumBufInfo info = {nullptr, 0};
	Picture src = random_picture(20, 6, 6), out(20, 6), wide = random_picture(40, 6, 7), wide_out(40, 6);
	ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &out.record, &info, 4, 1, 1), IEL_OK);
	const int32_t *first = info.ps32Buf;
	ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &out.record, &info, 0, 1, 1), IEL_OK);
	EXPECT_TRUE(info.ps32Buf == first && info.s32Size == (20 + 3 * 5) * 4);
	ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &out.record, &info, 4, 1, 3), IEL_OK);
	EXPECT_EQ(info.s32Size, 3 * (20 + 3 * 5) * 4);
	ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&wide.record, &wide_out.record, &info, 4, 2, 3), IEL_OK);
	EXPECT_EQ(info.s32Size, 3 * (40 + 3 * 5 * 2) * 4);
	free(info.ps32Buf);
}

TEST(EngineSepia, TonesAndLimits)
{
	/* Greys 206 and 207 have luminance 206, grey 244 has 244. */
	const std::vector<uint8_t> src = {0, 0, 0, 7, 255, 255, 255, 255, 206, 206, 206, 1, 207, 207, 207, 2, 244, 244, 244, 3};
	std::vector<uint8_t> out(src.size());
	iel_sepia_fast(src.data(), out.data(), 5, 4);
	EXPECT_EQ(out, (std::vector<uint8_t>{0, 12, 50, 7, 255, 255, 255, 255, 206, 218, 255, 1, 206, 218, 255, 2, 244, 255, 255, 3}));
	/* Pixels of 3 or 2 bytes write only their own bytes and read nothing
	 * past the last one (exact-size buffers). */
	std::vector<uint8_t> rgb = {0, 0, 0, 255, 255, 255}, rgb_out(6), two_byte(4, 0), two_out(4);
	iel_sepia_fast(rgb.data(), rgb_out.data(), 2, 3);
	EXPECT_EQ(rgb_out, (std::vector<uint8_t>{0, 12, 50, 255, 255, 255}));
	iel_sepia_fast(two_byte.data(), two_out.data(), 2, 2);
	EXPECT_EQ(two_out, (std::vector<uint8_t>{0, 12, 0, 12}));
}

TEST(EnginePosterize, LevelsAndRefusedStrengths)
{
	Picture src(2, 1), out(2, 1);
	const uint8_t bytes[8] = {0, 42, 43, 128, 255, 85, 86, 200};
	std::memcpy(src.data(), bytes, 8);
	ASSERT_EQ(IEL_Posterize(&src.record, &out.record, 2), IEL_OK);
	EXPECT_EQ(out.pixels(), (std::vector<uint8_t>{0, 0, 51, 153, 255, 51, 102, 204}));
	/* Three bytes a pixel: exactly width x height x 3 bytes are mapped. */
	Picture rgb(3, 2, IEL_FORMAT_RGB888, 3), rgb_out(3, 2, IEL_FORMAT_RGB888, 3);
	std::fill_n(rgb.bytes.begin(), rgb.size, 255);
	ASSERT_EQ(IEL_Posterize(&rgb.record, &rgb_out.record, 2), IEL_OK);
	EXPECT_TRUE(rgb_out.pixels() == std::vector<uint8_t>(18, 255) && rgb_out.guard_intact());

	Picture refused(2, 1);
	for (int strength : {-1, 7, 8})
		EXPECT_EQ(IEL_Posterize(&src.record, &refused.record, strength), IEL_ERR_INVALID_PARAM) << strength;
	EXPECT_TRUE(refused.untouched());
}
