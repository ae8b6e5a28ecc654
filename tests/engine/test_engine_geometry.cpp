/* Rotation, bilinear resize and sampling, area reduction, the region copy,
 * and the record checks every routine shares. */
#include <algorithm>
#include <cmath>
#include <functional>

#include "engine-test-util.h"

using namespace engine_test;

TEST(EngineRotate, TurnsCopiesAndRefusals)
{
	/* 3 x 2, each pixel holding its index. */
	std::vector<uint32_t> pixels = {0, 1, 2, 3, 4, 5}, out(6);
	IEL_Image src = {3, 2, IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(pixels.data())};
	IEL_Image dst = {0, 0, IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(out.data())};
	ASSERT_EQ(IEL_Rotate_Image(&src, &dst, 1), IEL_OK);
	EXPECT_TRUE(out == std::vector<uint32_t>({3, 0, 4, 1, 5, 2}) && dst.u32Width == 2 && dst.u32Height == 3);
	for (unsigned int rotation : {0u, 2u, 9u}) {
		std::fill(out.begin(), out.end(), 0);
		ASSERT_EQ(IEL_Rotate_Image(&src, &dst, rotation), IEL_OK);
		EXPECT_TRUE(out == pixels && dst.u32Width == 3 && dst.u32Height == 2) << rotation;
	}

	/* Right then left restores, for pixels of 2, 3 and 4 bytes. */
	for (size_t b : {2, 3, 4}) {
		const int format = b == 2 ? IEL_FORMAT_RGB565 : b == 3 ? IEL_FORMAT_RGB888 : IEL_FORMAT_BGRA8888;
		Picture picture = random_picture(37, 19, b, format, b), turned(19, 37, format, b), back(37, 19, format, b);
		ASSERT_EQ(IEL_Rotate_Image(&picture.record, &turned.record, 1), IEL_OK);
		ASSERT_EQ(IEL_Rotate_Image(&turned.record, &back.record, 3), IEL_OK);
		EXPECT_TRUE(back.pixels() == picture.pixels() && back.guard_intact() && back.record.u32Width == 37) << b;
	}

	for (unsigned int rotation : {10u, static_cast<unsigned int>(-1)}) {
		Picture refused(3, 5);
		platform_log_record_clear();
		EXPECT_EQ(IEL_Rotate_Image(&src, &refused.record, rotation), IEL_ERR_INVALID_PARAM);
		EXPECT_TRUE(refused.untouched() && refused.record.u32Width == 3);
		EXPECT_EQ(only_message(), "Unknow rot val:" + std::to_string(int(rotation)) + " \n");
	}
}

/* Each orientation written out on a 3 x 2 picture whose pixels hold their
 * index (0 1 2 / 3 4 5), so that a swapped axis or direction shows. */
TEST(EngineOrient, EachOrientationGivesTheUprightPicture)
{
	std::vector<uint32_t> pixels = {0, 1, 2, 3, 4, 5};
	IEL_Image src = {3, 2, IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(pixels.data())};
	const std::vector<uint32_t> upright[9] = {{}, {0, 1, 2, 3, 4, 5}, {2, 1, 0, 5, 4, 3}, {5, 4, 3, 2, 1, 0},
						  {3, 4, 5, 0, 1, 2}, {0, 3, 1, 4, 2, 5}, {3, 0, 4, 1, 5, 2},
						  {5, 2, 4, 1, 3, 0}, {2, 5, 1, 4, 0, 3}};
	for (unsigned int o = 1; o <= 8; o++) {
		Picture out(3, 2);
		ASSERT_EQ(IEL_Orient_Image(&src, &out.record, o), IEL_OK) << o;
		std::vector<uint32_t> got(6);
		std::memcpy(got.data(), out.data(), 24);
		EXPECT_EQ(got, upright[o]) << o;
		EXPECT_EQ(out.record.u32Width, o >= 5 ? 2u : 3u) << o;
		EXPECT_EQ(out.record.u32Height, o >= 5 ? 3u : 2u) << o;
		EXPECT_TRUE(out.guard_intact()) << o;
	}

	/* On pixels of 2, 3 and 4 bytes: 6 and 8 are the rotation's quarter
	 * turns, and undoing each orientation gives the stored picture back. */
	const unsigned int undo[9] = {0, 1, 2, 3, 4, 5, 8, 7, 6};
	for (size_t b : {2, 3, 4}) {
		const int format = b == 2 ? IEL_FORMAT_RGB565 : b == 3 ? IEL_FORMAT_RGB888 : IEL_FORMAT_BGRA8888;
		Picture stored = random_picture(37, 19, b, format, b);
		for (unsigned int o = 1; o <= 8; o++) {
			Picture shown(37, 19, format, b), back(37, 19, format, b);
			ASSERT_EQ(IEL_Orient_Image(&stored.record, &shown.record, o), IEL_OK);
			if (o == 6 || o == 8) {
				Picture turned(19, 37, format, b);
				ASSERT_EQ(IEL_Rotate_Image(&stored.record, &turned.record, o == 6 ? 1 : 3), IEL_OK);
				EXPECT_TRUE(turned.pixels() == shown.pixels()) << b << " bytes, " << o;
			}
			ASSERT_EQ(IEL_Orient_Image(&shown.record, &back.record, undo[o]), IEL_OK);
			EXPECT_TRUE(back.pixels() == stored.pixels() && back.guard_intact() && back.record.u32Width == 37)
				<< b << " bytes, " << o;
		}
	}

	for (unsigned int o : {0u, 9u, static_cast<unsigned int>(-1)}) {
		Picture refused(3, 5);
		platform_log_record_clear();
		EXPECT_EQ(IEL_Orient_Image(&src, &refused.record, o), IEL_ERR_INVALID_PARAM);
		EXPECT_TRUE(refused.untouched() && refused.record.u32Width == 3);
		EXPECT_EQ(only_message(), "Unknown orientation:" + std::to_string(int(o)) + " \n");
	}
}

TEST(EngineResize, OwnSizeAndHalving)
{
	/* At its own size every output pixel is the mean of the 2 x 2 block
	 * ending at it (clamped at the top and left), rounded half up. */
	const uint32_t w = 6, h = 5;
	Picture src = random_picture(w, h, 3), dst(w, h);
	ASSERT_EQ(IEL_Resize_Image(&src.record, &dst.record), IEL_OK);
	auto at = [&](uint32_t x, uint32_t y, int c) { return src.bytes[(y * w + x) * 4 + c]; };
	for (uint32_t i = 0; i < w * h * 4; i++) {
		const uint32_t x = i / 4 % w, y = i / 4 / w, c = i % 4, x0 = x ? x - 1 : 0, y0 = y ? y - 1 : 0;
		ASSERT_EQ(dst.bytes[i], (at(x0, y0, c) + at(x, y0, c) + at(x0, y, c) + at(x, y, c) + 2) / 4) << x << "," << y;
	}

	/* 2 x 2 to 1 x 1 takes the top-left pixel. */
	Picture square = random_picture(2, 2, 8), one(1, 1);
	ASSERT_EQ(IEL_Resize_Image(&square.record, &one.record), IEL_OK);
	EXPECT_TRUE(one.pixels() == std::vector<uint8_t>(square.bytes.begin(), square.bytes.begin() + 4) && one.guard_intact());
}

/* A source one pixel wide (or high) repeats its edge: the result equals the
 * same source with that column (or row) doubled. Exact-size buffers let the
 * address sanitizer see any read past them. */
TEST(EngineResize, SingleColumnOrRowRepeatsTheEdge)
{
	for (uint32_t length : {1u, 5u, 17u}) {
		std::vector<uint8_t> line = random_picture(length, 1, length).pixels(), columns, rows(line);
		rows.insert(rows.end(), line.begin(), line.end());
		for (uint32_t i = 0; i < length * 2; i++)
			columns.insert(columns.end(), &line[i / 2 * 4], &line[i / 2 * 4] + 4);
		for (const auto &to : {std::pair<uint32_t, uint32_t>{1, 1}, {7, 3}, {33, 11}}) {
			std::vector<uint8_t> out(to.first * to.second * 4), want(out.size());
			IEL_Image dst = {to.first, to.second, IEL_FORMAT_BGRA8888, out.data()};
			IEL_Image expected = {to.first, to.second, IEL_FORMAT_BGRA8888, want.data()};
			const IEL_Image sources[][2] = {{{1, length, IEL_FORMAT_BGRA8888, line.data()}, {2, length, IEL_FORMAT_BGRA8888, columns.data()}},
							{{length, 1, IEL_FORMAT_BGRA8888, line.data()}, {length, 2, IEL_FORMAT_BGRA8888, rows.data()}}};
			for (const auto &pair : sources) {
				ASSERT_EQ(IEL_Resize_Image(&pair[0], &dst), IEL_OK);
				ASSERT_EQ(IEL_Resize_Image(&pair[1], &expected), IEL_OK);
				EXPECT_EQ(out, want) << pair[0].u32Width << "x" << pair[0].u32Height;
			}
		}
	}
}

/* Each output pixel is the mean of the area it covers: exact for whole
 * blocks (rounded half up), within one step of the exact mean otherwise, and
 * a flat picture stays flat at any ratio. */
TEST(EngineReduce, MeanOfTheCoveredArea)
{
	const uint8_t block[] = {10, 20, 30, 255, 11, 21, 31, 255, 1, 2, 3, 4, 5, 6, 7, 8,
				 12, 22, 32, 255, 13, 21, 30, 0, 9, 9, 9, 9, 200, 100, 50, 25};
	const IEL_Image four_by_two = {4, 2, IEL_FORMAT_BGRA8888, const_cast<uint8_t *>(block)};
	Picture halves(2, 1);
	ASSERT_EQ(IEL_Reduce_Image(&four_by_two, &halves.record), IEL_OK);
	EXPECT_EQ(halves.pixels(), std::vector<uint8_t>({12, 21, 31, 191, 54, 29, 17, 12}));
	EXPECT_TRUE(halves.guard_intact());

	const uint32_t w = 37, h = 29;
	Picture src = random_picture(w, h, 77);
	for (const auto &to : {std::pair<uint32_t, uint32_t>{10, 7}, {36, 29}, {1, 29}, {37, 1}, {19, 15}}) {
		Picture dst(to.first, to.second);
		ASSERT_EQ(IEL_Reduce_Image(&src.record, &dst.record), IEL_OK);
		ASSERT_TRUE(dst.guard_intact());
		const double sx = double(w) / to.first, sy = double(h) / to.second;
		int worst = 0;
		for (uint32_t y = 0; y < to.second; y++)
			for (uint32_t x = 0; x < to.first; x++)
				for (int c = 0; c < 4; c++) {
					double sum = 0;
					for (uint32_t j = 0; j < h; j++)
						for (uint32_t i = 0; i < w; i++) {
							const double cover_x = std::max(0.0, std::min(i + 1.0, (x + 1) * sx) - std::max(double(i), x * sx));
							const double cover_y = std::max(0.0, std::min(j + 1.0, (y + 1) * sy) - std::max(double(j), y * sy));
							sum += cover_x * cover_y * src.bytes[(j * w + i) * 4 + c];
						}
					const double mean = sum / (sx * sy);
					worst = std::max(worst, int(std::abs(mean - dst.bytes[(y * to.first + x) * 4 + c]) + 0.5));
				}
		EXPECT_LE(worst, 1) << to.first << "x" << to.second;
	}

	Picture flat(23, 17);
	for (size_t i = 0; i < flat.size; i++)
		flat.bytes[i] = uint8_t(i % 4 * 60 + 7);
	for (const auto &to : {std::pair<uint32_t, uint32_t>{7, 5}, {22, 16}, {1, 1}}) {
		Picture dst(to.first, to.second);
		ASSERT_EQ(IEL_Reduce_Image(&flat.record, &dst.record), IEL_OK);
		for (size_t i = 0; i < dst.size; i++)
			ASSERT_EQ(dst.bytes[i], i % 4 * 60 + 7) << to.first << "x" << to.second << " at " << i;
	}
}

/* Fed a row at a time, the reducer writes each output row as soon as its
 * last source row is in, gives what the whole picture gives, and ignores
 * rows past the source's height. Larger outputs are refused. */
TEST(EngineReduce, RowByRowAndRefusals)
{
	const uint32_t w = 31, h = 23;
	Picture src = random_picture(w, h, 5), whole(12, 9), fed(12, 9);
	ASSERT_EQ(IEL_Reduce_Image(&src.record, &whole.record), IEL_OK);
	IEL_Reducer *reducer = nullptr;
	ASSERT_EQ(IEL_Reducer_Create(w, h, &fed.record, &reducer), IEL_OK);
	for (uint32_t y = 0; y < h; y++) {
		ASSERT_EQ(IEL_Reducer_Push(reducer, src.data() + y * w * 4, 1), IEL_OK);
		/* Output row k covers source rows up to (k + 1) x 23 / 9. */
		const uint32_t done = (y + 1) * 9 / 23;
		EXPECT_TRUE(std::equal(whole.bytes.begin(), whole.bytes.begin() + done * 12 * 4, fed.bytes.begin())) << y;
		EXPECT_EQ(fed.bytes[done * 12 * 4], kSentinel) << y;
	}
	ASSERT_EQ(IEL_Reducer_Push(reducer, src.data(), h), IEL_OK);
	IEL_Reducer_Destroy(reducer);
	EXPECT_TRUE(fed.pixels() == whole.pixels() && fed.guard_intact());

	Picture larger(32, 2);
	EXPECT_EQ(IEL_Reduce_Image(&src.record, &larger.record), IEL_ERR_INVALID_SIZE);
	EXPECT_EQ(IEL_Reducer_Create(w, h, &larger.record, &reducer), IEL_ERR_INVALID_SIZE);
	EXPECT_EQ(reducer, nullptr);
	EXPECT_TRUE(larger.untouched());
	EXPECT_EQ(IEL_Reducer_Push(nullptr, src.data(), 1), IEL_ERR_INVALID_PARAM);
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

TEST(EngineCrop, CopiesTheRegionAndRefusesOneOutsideTheSource)
{
	/* 10 x 9 pixels of 2 bytes into 3 x 5 from (3, 2): 6 bytes from each of
	 * the rows 2 to 6, from byte 2 x (row x 10 + 3). */
	Picture src = random_picture(10, 9, 4, IEL_FORMAT_RGB565, 2), dst(3, 5, IEL_FORMAT_BGRA8888, 2);
	ASSERT_EQ(IEL_Crop_Image(&src.record, &dst.record, 3, 2), IEL_OK);
	std::vector<uint8_t> want;
	for (size_t row = 2; row <= 6; row++)
		want.insert(want.end(), &src.bytes[2 * (row * 10 + 3)], &src.bytes[2 * (row * 10 + 3)] + 6);
	EXPECT_TRUE(dst.pixels() == want && dst.guard_intact());

	struct Case { uint32_t width, height; int x, y, result; };
	for (const Case &c : {Case{11, 9, 0, 0, IEL_ERR_INVALID_PARAM}, Case{10, 10, 0, 0, IEL_ERR_INVALID_PARAM},
			      Case{3, 3, -1, 0, IEL_ERR_INVALID_PARAM}, Case{3, 3, 0, -1, IEL_ERR_INVALID_PARAM},
			      Case{3, 3, 8, 0, IEL_ERR_INVALID_PARAM}, Case{3, 3, 0, 7, IEL_ERR_INVALID_PARAM},
			      Case{3, 3, 7, 6, IEL_OK}, Case{10, 9, 0, 0, IEL_OK}}) {
		Picture out(c.width, c.height, IEL_FORMAT_RGB565, 2);
		EXPECT_EQ(IEL_Crop_Image(&src.record, &out.record, c.x, c.y), c.result) << c.x << "," << c.y;
		EXPECT_TRUE(c.result == IEL_OK ? out.guard_intact() : out.untouched());
	}
}

TEST(EngineCrop, InItsOwnBufferGivesTheCopysPixels)
{
	/* Every size from one pixel, odd widths, regions at each edge and the
	 * whole picture, for pixels of 2, 3 and 4 bytes: the packed rows at
	 * the buffer's start equal the copy into a buffer of its own. */
	uint32_t seed = 1;
	for (size_t b : {2, 3, 4}) {
		const int format = b == 2 ? IEL_FORMAT_RGB565 : b == 3 ? IEL_FORMAT_RGB888 : IEL_FORMAT_BGRA8888;
		for (uint32_t w : {1u, 2u, 7u, 33u}) {
			for (uint32_t h : {1u, 3u, 16u}) {
				const Picture picture = random_picture(w, h, seed++, format, b);
				for (uint32_t cw = 1; cw <= w; cw += (w > 8 ? 5 : 1)) {
					for (uint32_t ch = 1; ch <= h; ch += (h > 8 ? 4 : 1)) {
						for (int x : {0, int(w - cw) / 2, int(w - cw)}) {
							for (int y : {0, int(h - ch)}) {
								Picture copy(cw, ch, format, b), in_place(picture);
								ASSERT_EQ(IEL_Crop_Image(&picture.record, &copy.record, x, y), IEL_OK);
								IEL_Image region = in_place.record;
								region.u32Width = cw;
								region.u32Height = ch;
								ASSERT_EQ(IEL_Crop_Image(&in_place.record, &region, x, y), IEL_OK);
								const size_t n = cw * ch * b;
								ASSERT_TRUE(std::equal(copy.bytes.begin(), copy.bytes.begin() + n,
										       in_place.bytes.begin()))
									<< b << " bytes, " << w << "x" << h << " -> " << cw << "x" << ch
									<< " at " << x << "," << y;
								ASSERT_TRUE(in_place.guard_intact());
							}
						}
					}
				}
			}
		}
	}
}

/* Each routine refuses a missing record, missing pixels, an empty source,
 * an unknown format and a size whose byte count overflows, and writes
 * nothing. -1: the routine does not look at that. */
TEST(EngineRecords, EveryRoutineRefusesBadRecords)
{
	using Routine = std::function<int(const IEL_Image *, IEL_Image *)>;
	struct Case { const char *name; Routine run; int null, no_pixels, empty, format, huge; };
	const Case cases[] = {
		{"rotate", [](auto *s, auto *d) { return IEL_Rotate_Image(s, d, 1); }, 1, 1, IEL_OK, -1, 3},
		{"orient", [](auto *s, auto *d) { return IEL_Orient_Image(s, d, 7); }, 1, 1, IEL_OK, 4, 3},
		{"resize", [](auto *s, auto *d) { return IEL_Resize_Image(s, d); }, 1, 1, 3, -1, 3},
		{"crop", [](auto *s, auto *d) { return IEL_Crop_Image(s, d, 0, 0); }, 1, 1, 3, 4, 3},
		{"reduce", [](auto *s, auto *d) { return IEL_Reduce_Image(s, d); }, 1, 1, 3, 4, 3},
		{"blend", [](auto *s, auto *d) { return IEL_Alpha_blending(s, d, 50); }, 1, 1, 3, 4, 3},
		{"posterise", [](auto *s, auto *d) { return IEL_Posterize(s, d, 2); }, 1, 1, 3, 4, 3},
		{"blur", [](auto *s, auto *d) { IEL_RowSumBufInfo info = {nullptr, 0};
			 return IEL_Variable_Blur_BGRA888_skip(s, d, &info, 4, 1, 1); }, 1, 1, 3, 4, 3},
		{"dispatch", [](auto *s, auto *d) { return IEL_Run_Effect(const_cast<IEL_Image *>(s), d, 0); }, 1, 1, 3, 4, 3}};
	Picture src = random_picture(8, 6, 9);
	const IEL_Image empty = {0, 6, IEL_FORMAT_BGRA8888, src.data()}, format5 = {8, 6, 5, src.data()};
	const IEL_Image huge = {0xffffffffu, 0xffffffffu, IEL_FORMAT_BGRA8888, src.data()};
	for (const Case &c : cases) {
		Picture dst(2, 2);
		IEL_Image no_pixels = {2, 2, IEL_FORMAT_BGRA8888, nullptr};
		EXPECT_EQ(c.run(nullptr, &dst.record), c.null) << c.name;
		EXPECT_EQ(c.run(&src.record, &no_pixels), c.no_pixels) << c.name;
		EXPECT_EQ(c.run(&empty, &dst.record), c.empty) << c.name;
		EXPECT_TRUE(c.format < 0 || c.run(&format5, &dst.record) == c.format) << c.name;
		EXPECT_EQ(c.run(&huge, &dst.record), c.huge) << c.name;
		EXPECT_TRUE(dst.untouched()) << c.name;
	}
}
