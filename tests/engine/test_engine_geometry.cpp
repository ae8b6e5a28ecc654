/* Rotation, bilinear resize and sampling, and the region copy: the
 * algorithm's own examples, the guards, and the mended cases (sources one
 * pixel wide or high, regions outside the source, sizes that overflow). */
#include <dlog.h>

#include <string>

#include "engine-test-util.h"

using namespace engine_test;

namespace {

std::vector<uint8_t> bytes_of(const std::vector<uint32_t> &pixels)
{
	std::vector<uint8_t> bytes(pixels.size() * 4);
	std::memcpy(bytes.data(), pixels.data(), bytes.size());
	return bytes;
}

}

TEST(EngineRotate, QuarterTurnsAndTheirInverse)
{
	/* 3 x 2, each pixel holding its index. */
	std::vector<uint8_t> src_bytes = bytes_of({0, 1, 2, 3, 4, 5}), out(24);
	IEL_Image src = {3, 2, IEL_FORMAT_BGRA8888, src_bytes.data()};
	IEL_Image dst = {0, 0, IEL_FORMAT_BGRA8888, out.data()};
	ASSERT_EQ(IEL_Rotate_Image(&src, &dst, 1), IEL_OK);
	EXPECT_EQ(out, bytes_of({3, 0, 4, 1, 5, 2}));
	EXPECT_TRUE(dst.u32Width == 2 && dst.u32Height == 3);
	ASSERT_EQ(IEL_Rotate_Image(&src, &dst, 3), IEL_OK);
	EXPECT_EQ(out, bytes_of({2, 5, 1, 4, 0, 3}));

	/* Right then left restores, for pixels of 2, 3 and 4 bytes. */
	for (size_t b : {2, 3, 4}) {
		const int format = b == 2 ? IEL_FORMAT_RGB565 : b == 3 ? IEL_FORMAT_RGB888 : IEL_FORMAT_BGRA8888;
		Picture picture = random_picture(37, 19, b, format, b), turned(19, 37, format, b), back(37, 19, format, b);
		ASSERT_EQ(IEL_Rotate_Image(&picture.record, &turned.record, 1), IEL_OK);
		ASSERT_EQ(IEL_Rotate_Image(&turned.record, &back.record, 3), IEL_OK);
		EXPECT_TRUE(back.pixels() == picture.pixels() && back.guard_intact()) << b;
		EXPECT_TRUE(back.record.u32Width == 37 && back.record.u32Height == 19);
	}
}

TEST(EngineRotate, OtherValuesCopyAndLargerOnesAreRefused)
{
	Picture src = random_picture(5, 3, 1);
	for (unsigned int rotation : {0u, 2u, 9u}) {
		Picture dst(1, 1);
		std::vector<uint8_t> out(src.size);
		dst.record.pbBuf = out.data();
		ASSERT_EQ(IEL_Rotate_Image(&src.record, &dst.record, rotation), IEL_OK);
		EXPECT_TRUE(out == src.pixels() && dst.record.u32Width == 5 && dst.record.u32Height == 3) << rotation;
	}
	for (unsigned int rotation : {10u, static_cast<unsigned int>(-1)}) {
		Picture dst(3, 5);
		dlog_record_clear();
		EXPECT_EQ(IEL_Rotate_Image(&src.record, &dst.record, rotation), IEL_ERR_INVALID_PARAM);
		EXPECT_TRUE(dst.untouched() && dst.record.u32Width == 3);
		ASSERT_EQ(dlog_record_count(), 1u);
		EXPECT_STREQ(dlog_record_tag(0), "MARLUNE");
		EXPECT_EQ(dlog_record_priority(0), DLOG_ERROR);
		const std::string expected = "ie-rotate.cpp: IEL_Rotate_Image(";
		const std::string message = "> \033[31mUnknow rot val:" + std::to_string(int(rotation)) + " \n\033[0m";
		const std::string text = dlog_record_text(0);
		EXPECT_EQ(text.rfind(expected, 0), 0u) << text;
		EXPECT_EQ(text.substr(text.size() - message.size()), message);
	}
}

TEST(EngineRotate, ZeroWidthAndBadRecords)
{
	uint8_t pixel[4] = {1, 2, 3, 4};
	IEL_Image empty = {0, 6, IEL_FORMAT_BGRA8888, pixel};
	IEL_Image dst = {9, 9, IEL_FORMAT_BGRA8888, pixel};
	ASSERT_EQ(IEL_Rotate_Image(&empty, &dst, 1), IEL_OK);
	EXPECT_TRUE(dst.u32Width == 6 && dst.u32Height == 0 && pixel[0] == 1);

	IEL_Image no_pixels = {2, 2, IEL_FORMAT_BGRA8888, nullptr};
	EXPECT_EQ(IEL_Rotate_Image(nullptr, &dst, 1), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(IEL_Rotate_Image(&no_pixels, &dst, 1), IEL_ERR_INVALID_PARAM);
	IEL_Image huge = huge_record(pixel);
	EXPECT_EQ(IEL_Rotate_Image(&huge, &dst, 1), IEL_ERR_INVALID_SIZE);
}

TEST(EngineResize, OwnSizeAndHalving)
{
	/* At its own size every output pixel is the mean of the 2 x 2 block
	 * ending at it (clamped at the top and left), rounded half up. */
	const uint32_t w = 6, h = 5;
	Picture src = random_picture(w, h, 3), dst(w, h);
	ASSERT_EQ(IEL_Resize_Image(&src.record, &dst.record), IEL_OK);
	auto at = [&](uint32_t x, uint32_t y, int c) { return src.bytes[(y * w + x) * 4 + c]; };
	for (uint32_t y = 0; y < h; y++)
		for (uint32_t x = 0; x < w; x++)
			for (int c = 0; c < 4; c++) {
				const uint32_t x0 = x ? x - 1 : 0, y0 = y ? y - 1 : 0;
				const int sum = at(x0, y0, c) + at(x, y0, c) + at(x0, y, c) + at(x, y, c);
				ASSERT_EQ(dst.bytes[(y * w + x) * 4 + c], (sum + 2) / 4) << x << "," << y;
			}

	/* 2 x 2 to 1 x 1 takes the top-left pixel. */
	std::vector<uint8_t> square = bytes_of({0x11223344, 0x55667788, 0x99aabbcc, 0xddeeff00});
	IEL_Image from = {2, 2, IEL_FORMAT_BGRA8888, square.data()};
	uint32_t one = 0;
	IEL_Image to = {1, 1, IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(&one)};
	ASSERT_EQ(IEL_Resize_Image(&from, &to), IEL_OK);
	EXPECT_EQ(one, 0x11223344u);
}

/* A source one pixel wide (or high) repeats its edge: the result equals the
 * same source with that column (or row) doubled. Exact-size buffers let the
 * address sanitizer see any read past them. */
TEST(EngineResize, SingleColumnOrRowRepeatsTheEdge)
{
	for (uint32_t length : {1u, 5u, 17u}) {
		std::vector<uint8_t> line = random_picture(length, 1, length).pixels();
		std::vector<uint8_t> doubled_columns, doubled_rows(line);
		doubled_rows.insert(doubled_rows.end(), line.begin(), line.end());
		for (uint32_t i = 0; i < length; i++)
			for (int copy = 0; copy < 2; copy++)
				doubled_columns.insert(doubled_columns.end(), &line[i * 4], &line[i * 4] + 4);
		for (const auto &to : {std::pair<uint32_t, uint32_t>{1, 1}, {7, 3}, {33, 11}}) {
			std::vector<uint8_t> out(to.first * to.second * 4), want(out.size());
			IEL_Image dst = {to.first, to.second, IEL_FORMAT_BGRA8888, out.data()};
			IEL_Image expected = {to.first, to.second, IEL_FORMAT_BGRA8888, want.data()};
			const IEL_Image column = {1, length, IEL_FORMAT_BGRA8888, line.data()};
			const IEL_Image two_columns = {2, length, IEL_FORMAT_BGRA8888, doubled_columns.data()};
			ASSERT_EQ(IEL_Resize_Image(&column, &dst), IEL_OK);
			ASSERT_EQ(IEL_Resize_Image(&two_columns, &expected), IEL_OK);
			EXPECT_EQ(out, want) << "column of " << length;
			const IEL_Image row = {length, 1, IEL_FORMAT_BGRA8888, line.data()};
			const IEL_Image two_rows = {length, 2, IEL_FORMAT_BGRA8888, doubled_rows.data()};
			ASSERT_EQ(IEL_Resize_Image(&row, &dst), IEL_OK);
			ASSERT_EQ(IEL_Resize_Image(&two_rows, &expected), IEL_OK);
			EXPECT_EQ(out, want) << "row of " << length;
		}
	}
}

TEST(EngineResize, BadRecords)
{
	uint8_t pixels[16] = {};
	IEL_Image ok = {2, 2, IEL_FORMAT_BGRA8888, pixels}, empty = {0, 2, IEL_FORMAT_BGRA8888, pixels};
	IEL_Image huge = huge_record(pixels);
	EXPECT_EQ(IEL_Resize_Image(nullptr, &ok), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(IEL_Resize_Image(&empty, &ok), IEL_ERR_INVALID_SIZE);
	EXPECT_EQ(IEL_Resize_Image(&ok, &huge), IEL_ERR_INVALID_SIZE);
	EXPECT_EQ(IEL_Resize_Image(&huge, &ok), IEL_ERR_INVALID_SIZE);
}

TEST(EngineSample, RoundsHalfUpAndReadsOnlyWeightedNeighbours)
{
	/* A row of two pixels: at y = 0 the row below is not read. */
	const uint32_t row[2] = {0x0a0a0a0a, 0x0b0b0b0b};
	EXPECT_EQ(IEL_Bilinear_Sample(0.5, 0.0, row, 2), 0x0b0b0b0bu);
	EXPECT_EQ(IEL_Bilinear_Sample(0.25, 0.0, row, 2), 0x0a0a0a0au);
	const uint32_t single[1] = {0x80402010};
	EXPECT_EQ(IEL_Bilinear_Sample(0.7, 0.0, single, 1), 0x80402010u);
	const uint32_t block[4] = {0x00000000, 0x04030201, 0x08060402, 0x0c090603};
	EXPECT_EQ(IEL_Bilinear_Sample(0.5, 0.5, block, 2), 0x06050302u);
}

TEST(EngineCrop, CopiesTheRegion)
{
	/* 10 x 9 pixels of 2 bytes into 3 x 5 from (3, 2): 6 bytes from each of
	 * the rows 2 to 6, from byte 2 x (row x 10 + 3). */
	Picture src = random_picture(10, 9, 4, IEL_FORMAT_RGB565, 2), dst(3, 5, IEL_FORMAT_BGRA8888, 2);
	ASSERT_EQ(IEL_Crop_Image(&src.record, &dst.record, 3, 2), IEL_OK);
	std::vector<uint8_t> want;
	for (size_t row = 2; row <= 6; row++)
		want.insert(want.end(), &src.bytes[2 * (row * 10 + 3)], &src.bytes[2 * (row * 10 + 3)] + 6);
	EXPECT_TRUE(dst.pixels() == want && dst.guard_intact());
	EXPECT_TRUE(dst.record.u32Width == 3 && dst.record.eFormat == IEL_FORMAT_BGRA8888);

	Picture whole = random_picture(7, 4, 5), copy(7, 4), flat(3, 0);
	ASSERT_EQ(IEL_Crop_Image(&whole.record, &copy.record, 0, 0), IEL_OK);
	EXPECT_TRUE(copy.pixels() == whole.pixels());
	EXPECT_EQ(IEL_Crop_Image(&whole.record, &flat.record, 1, 1), IEL_OK);
}

TEST(EngineCrop, RefusesBadRecordsAndRegionsOutsideTheSource)
{
	Picture src = random_picture(8, 6, 9);
	struct Case { uint32_t width, height; int x, y, result; };
	for (const Case &c : {Case{9, 6, 0, 0, IEL_ERR_INVALID_PARAM}, Case{8, 7, 0, 0, IEL_ERR_INVALID_PARAM},
			      Case{3, 3, -1, 0, IEL_ERR_INVALID_PARAM}, Case{3, 3, 0, -1, IEL_ERR_INVALID_PARAM},
			      Case{3, 3, 6, 0, IEL_ERR_INVALID_PARAM}, Case{3, 3, 0, 4, IEL_ERR_INVALID_PARAM},
			      Case{3, 3, 5, 3, IEL_OK}}) {
		Picture dst(c.width, c.height);
		EXPECT_EQ(IEL_Crop_Image(&src.record, &dst.record, c.x, c.y), c.result) << c.x << "," << c.y;
		EXPECT_TRUE(c.result == IEL_OK || dst.untouched());
	}
	Picture dst(2, 2);
	IEL_Image no_pixels = {2, 2, IEL_FORMAT_BGRA8888, nullptr}, empty = {8, 0, IEL_FORMAT_BGRA8888, src.data()};
	IEL_Image format5 = {8, 6, 5, src.data()}, huge = huge_record(src.data());
	EXPECT_EQ(IEL_Crop_Image(nullptr, &dst.record, 0, 0), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(IEL_Crop_Image(&src.record, &no_pixels, 0, 0), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(IEL_Crop_Image(&empty, &dst.record, 0, 0), IEL_ERR_INVALID_SIZE);
	EXPECT_EQ(IEL_Crop_Image(&format5, &dst.record, 0, 0), IEL_ERR_UNSUPPORTED_FORMAT);
	EXPECT_EQ(IEL_Crop_Image(&huge, &dst.record, 0, 0), IEL_ERR_INVALID_SIZE);
	EXPECT_TRUE(dst.untouched());
}
