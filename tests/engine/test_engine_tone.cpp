/* Blending, blur, sepia and posterise: the algorithm's own examples, the
 * guards with their messages, and the mended cases (blur on pictures smaller
 * than the kernel's reach, out-of-range steps and strengths, NaN alpha). */
#include <dlog.h>

#include <algorithm>
#include <cmath>
#include <string>

#include "engine-test-util.h"
#include "ie-engine-private.h"

using namespace engine_test;

namespace {

/* The message of the single logged line, checked for the engine's tag,
 * priority and colour. */
std::string only_message()
{
	if (dlog_record_count() != 1)
		return std::to_string(dlog_record_count()) + " lines";
	EXPECT_STREQ(dlog_record_tag(0), "MARLUNE");
	EXPECT_EQ(dlog_record_priority(0), DLOG_ERROR);
	const std::string text = dlog_record_text(0);
	const size_t start = text.find("\033[31m"), end = text.rfind("\033[0m");
	return start == std::string::npos || end == std::string::npos ? text : text.substr(start + 5, end - start - 5);
}

int blur(Picture &src, Picture &dst, unsigned int level = 4, int column_step = 1, int row_step = 1)
{
	IEL_RowSumBufInfo info = {nullptr, 0};
	const int result = IEL_Variable_Blur_BGRA888_skip(&src.record, &dst.record, &info, level, column_step, row_step);
	free(info.ps32Buf);
	return result;
}

}

TEST(EngineBlend, EndsOfTheRangeKeepAlpha)
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
		EXPECT_EQ(inout.pixels(), c.result) << c.alpha;
		EXPECT_TRUE(inout.guard_intact());
	}
}

TEST(EngineBlend, RefusesAlphaFirstThenRecords)
{
	Picture effect = random_picture(3, 2, 1), inout = random_picture(3, 2, 2);
	const std::vector<uint8_t> before = inout.pixels();
	struct Case { float alpha; int shown; };
	for (const Case &c : {Case{100.5f, 100}, Case{-0.5f, 0}, Case{NAN, 0}, Case{1e20f, 2147483647}}) {
		dlog_record_clear();
		EXPECT_EQ(IEL_Alpha_blending(nullptr, &inout.record, c.alpha), IEL_ERR_INVALID_PARAM);
		EXPECT_EQ(only_message(), "IEL_Alpha_blending Invalid  alpha val:" + std::to_string(c.shown) + " \n");
	}
	IEL_Image no_pixels = {3, 2, IEL_FORMAT_BGRA8888, nullptr}, empty = {0, 2, IEL_FORMAT_BGRA8888, effect.data()};
	IEL_Image format0 = {3, 2, 0, effect.data()};
	dlog_record_clear();
	EXPECT_EQ(IEL_Alpha_blending(&effect.record, &no_pixels, 50), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(IEL_Alpha_blending(&empty, &inout.record, 50), IEL_ERR_INVALID_SIZE);
	EXPECT_EQ(IEL_Alpha_blending(&format0, &inout.record, 50), IEL_ERR_UNSUPPORTED_FORMAT);
	EXPECT_EQ(dlog_record_count(), 0u);
	EXPECT_TRUE(inout.pixels() == before);
}

TEST(EngineBlur, UniformPicturesAndLevelsAboveFour)
{
	for (uint32_t size : {1u, 3u, 13u}) {
		Picture white = filled_picture(size, size, 255), black = filled_picture(size, size, 0), out(size, size);
		ASSERT_EQ(blur(white, out), IEL_OK);
		EXPECT_TRUE(out.pixels() == std::vector<uint8_t>(out.size, 254) && out.guard_intact());
		ASSERT_EQ(blur(black, out), IEL_OK);
		EXPECT_TRUE(out.pixels() == std::vector<uint8_t>(out.size, 0));
	}
	Picture src = random_picture(23, 17, 4), level4(23, 17), level9(23, 17);
	ASSERT_EQ(blur(src, level4, 4), IEL_OK);
	ASSERT_EQ(blur(src, level9, 9), IEL_OK);
	EXPECT_TRUE(level4.pixels() == level9.pixels());
}

/* The running sums against a direct sum of the K x K samples under the edge
 * rule (rows above the picture count as the first row of the same phase,
 * rows below as the last row, columns outside as the nearest column), on
 * pictures down to 1 x 1, narrower than the kernel's reach and lower than
 * the row step. Exact-size buffers let the sanitizer see stray accesses. */
TEST(EngineBlur, MatchesDirectSumsOnSmallPictures)
{
	struct Shape { unsigned int level; int column_step, row_step; };
	for (const Shape &s : {Shape{4, 1, 1}, Shape{0, 1, 1}, Shape{2, 3, 2}, Shape{4, 10, 10}, Shape{1, 7, 3}}) {
		const int r = static_cast<int>(iel_blur_radius(s.level));
		const int32_t recip = (1 << 18) / ((2 * r + 1) * (2 * r + 1));
		for (int h = 1; h <= 12; h++)
			for (int w = 1; w <= 12; w++) {
				std::vector<uint8_t> src = random_picture(w, h, w * 13 + h).pixels(), out(src.size());
				IEL_Image src_record = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, src.data()};
				IEL_Image out_record = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, out.data()};
				IEL_RowSumBufInfo info = {nullptr, 0};
				ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&src_record, &out_record, &info, s.level, s.column_step,
									 s.row_step), IEL_OK);
				free(info.ps32Buf);
				for (int i = 0; i < w * h * 4; i++) {
					const int x = i / 4 % w, y = i / 4 / w, c = i % 4;
					int32_t total = 0;
					for (int u = -r; u <= r; u++)
						for (int t = -r; t <= r; t++) {
							const int row = std::min(y + u * s.row_step < 0 ? y % s.row_step : y + u * s.row_step, h - 1);
							const int col = std::clamp(x + t * s.column_step, 0, w - 1);
							total += src[(row * w + col) * 4 + c];
						}
					ASSERT_EQ(out[i], (total * recip) >> 18) << w << "x" << h << " level " << s.level << " at " << x << "," << y;
				}
			}
	}
}

TEST(EngineBlur, ChecksInOrderWithTheirMessages)
{
	Picture src = random_picture(8, 8, 5), out(8, 8);
	IEL_RowSumBufInfo info = {nullptr, 0};
	IEL_Image empty = {8, 0, IEL_FORMAT_BGRA8888, src.data()}, format7 = {8, 8, 7, src.data()};
	IEL_Image rgb = {8, 8, IEL_FORMAT_RGB888, src.data()}, huge = huge_record(src.data());
	dlog_record_clear();
	EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(nullptr, &out.record, &info, 4, 1, 1), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(&empty, &out.record, &info, 4, 1, 1), IEL_ERR_INVALID_SIZE);
	EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(&format7, &out.record, &info, 4, 1, 1), IEL_ERR_UNSUPPORTED_FORMAT);
	EXPECT_EQ(dlog_record_count(), 0u);
	EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(&rgb, &out.record, &info, 4, 1, 1), IEL_ERR_UNSUPPORTED_FORMAT);
	EXPECT_EQ(only_message(), "Only BGRA888 is supported \n");
	dlog_record_clear();
	EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &out.record, nullptr, 4, 1, 1), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(only_message(), "Null One row sum buffer info \n");
	for (const auto &steps : {std::pair<int, int>{0, 1}, {1, 0}, {11, 1}, {1, 11}}) {
		dlog_record_clear();
		EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &out.record, &info, 4, steps.first, steps.second),
			  IEL_ERR_INVALID_PARAM);
		EXPECT_EQ(only_message(), "Invalid skip step:" + std::to_string(steps.first) + "," + std::to_string(steps.second) + " \n");
	}
	EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(&huge, &out.record, &info, 4, 1, 1), IEL_ERR_INVALID_SIZE);
	EXPECT_EQ(info.ps32Buf, nullptr);
	IEL_RowSumBufInfo sized_but_empty = {nullptr, 1 << 20};
	dlog_record_clear();
	EXPECT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &out.record, &sized_but_empty, 4, 1, 1), IEL_ERR_ALLOC);
	EXPECT_EQ(only_message(), "Failed to allocate ps32SumRowR \n");
	EXPECT_TRUE(out.untouched());
}

/* The caller's buffer is kept while large enough and renewed when the width
 * or the row step grows, so a larger step never overruns it. */
TEST(EngineBlur, ReusesAndRenewsTheRowSumBuffer)
{
	IEL_RowSumBufInfo info = {nullptr, 0};
	Picture src = random_picture(20, 6, 6), out(20, 6), wide = random_picture(40, 6, 7), wide_out(40, 6);
	ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &out.record, &info, 4, 1, 1), IEL_OK);
	const int32_t *first = info.ps32Buf;
	EXPECT_EQ(info.s32Size, (20 + 3 * 5) * 4);
	ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &out.record, &info, 0, 1, 1), IEL_OK);
	EXPECT_EQ(info.ps32Buf, first);
	ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &out.record, &info, 4, 1, 3), IEL_OK);
	EXPECT_EQ(info.s32Size, 3 * (20 + 3 * 5) * 4);
	ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&wide.record, &wide_out.record, &info, 4, 2, 3), IEL_OK);
	EXPECT_EQ(info.s32Size, 3 * (40 + 3 * 5 * 2) * 4);
	free(info.ps32Buf);
}

TEST(EngineSepia, TonesAndLimits)
{
	auto sepia = [](std::vector<uint8_t> pixel) {
		std::vector<uint8_t> out(4);
		iel_sepia_fast(pixel.data(), out.data(), 1, 4);
		return out;
	};
	EXPECT_EQ(sepia({0, 0, 0, 7}), (std::vector<uint8_t>{0, 12, 50, 7}));
	EXPECT_EQ(sepia({255, 255, 255, 255}), (std::vector<uint8_t>{255, 255, 255, 255}));
	/* Greys whose luminance is 206 and 244, found with the tables'
	 * definition (i x weight x 1024, rounded). */
	auto luminance = [](int v) {
		auto scaled = [v](double weight) { return static_cast<int>(std::lround(v * weight * 1024)); };
		return (scaled(0.587) + scaled(0.299) + scaled(0.114)) >> 10;
	};
	int found = 0;
	for (int v = 0; v < 256; v++) {
		const uint8_t g = static_cast<uint8_t>(v);
		if (luminance(v) == 206) {
			found++;
			EXPECT_EQ(sepia({g, g, g, 1}), (std::vector<uint8_t>{206, 218, 255, 1}));
		}
		if (luminance(v) == 244) {
			found++;
			EXPECT_EQ(sepia({g, g, g, 1}), (std::vector<uint8_t>{244, 255, 255, 1}));
		}
	}
	EXPECT_GE(found, 2);

	/* Pixels of 3 or 2 bytes write only their own bytes and read nothing
	 * past the last one (exact-size buffers). */
	std::vector<uint8_t> rgb = {0, 0, 0, 255, 255, 255}, rgb_out(6), two_byte(4, 0), two_out(4);
	iel_sepia_fast(rgb.data(), rgb_out.data(), 2, 3);
	EXPECT_EQ(rgb_out, (std::vector<uint8_t>{0, 12, 50, 255, 255, 255}));
	iel_sepia_fast(two_byte.data(), two_out.data(), 2, 2);
	EXPECT_EQ(two_out, (std::vector<uint8_t>{0, 12, 0, 12}));
}

TEST(EnginePosterize, LevelsAndRefusals)
{
	Picture src(2, 1), out(2, 1);
	const uint8_t bytes[8] = {0, 42, 43, 128, 255, 85, 86, 200};
	std::memcpy(src.data(), bytes, 8);
	ASSERT_EQ(IEL_Posterize(&src.record, &out.record, 2), IEL_OK);
	EXPECT_EQ(out.pixels(), (std::vector<uint8_t>{0, 0, 51, 153, 255, 51, 102, 204}));

	/* Three bytes a pixel: exactly width x height x 3 bytes are mapped. */
	Picture rgb = filled_picture(3, 2, 255), rgb_out(3, 2, IEL_FORMAT_RGB888, 3);
	rgb.record.eFormat = IEL_FORMAT_RGB888;
	ASSERT_EQ(IEL_Posterize(&rgb.record, &rgb_out.record, 2), IEL_OK);
	EXPECT_TRUE(rgb_out.pixels() == std::vector<uint8_t>(18, 255) && rgb_out.guard_intact());

	Picture refused(2, 1);
	for (int strength : {-1, 7, 8})
		EXPECT_EQ(IEL_Posterize(&src.record, &refused.record, strength), IEL_ERR_INVALID_PARAM) << strength;
	IEL_Image empty = {0, 1, IEL_FORMAT_BGRA8888, src.data()}, format5 = {2, 1, 5, src.data()};
	IEL_Image huge = huge_record(src.data());
	EXPECT_EQ(IEL_Posterize(nullptr, &refused.record, 2), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(IEL_Posterize(&empty, &refused.record, 2), IEL_ERR_INVALID_SIZE);
	EXPECT_EQ(IEL_Posterize(&format5, &refused.record, 2), IEL_ERR_UNSUPPORTED_FORMAT);
	EXPECT_EQ(IEL_Posterize(&huge, &refused.record, 2), IEL_ERR_INVALID_SIZE);
	EXPECT_TRUE(refused.untouched());
}
