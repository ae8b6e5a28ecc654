/* Our decoding of JPEG and PNG. Progressive JPEG: every coefficient it keeps
 * equals libjpeg's own reading of the file, over sizes from 1 x 1, every
 * common sampling, scan scripts with and without successive approximation,
 * restart intervals, and each scale, on the processor's bit operations and
 * on the portable ones, on one thread and on two; its pixels are libjpeg's scaled decoding within
 * the rounding of a different inverse DCT. PNG: the rows are libpng's, byte
 * for byte, for every colour kind, filter and split of the image data; the
 * unfilter's fast path is its reference's. Anything either does not take
 * is handed back. */
#include <gtest/gtest.h>

#include <jpeglib.h>
#include <png.h>
#include <isa-l/crc.h>

#include <cmath>
#include <cstdio>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "ie-engine-private.h"
#include "ie-image-decode.h"
#include "ie-image-png.h"
#include "ie-image-progressive.h"
#include "test-jpeg-encode.h"

namespace {

constexpr int NATURAL_ORDER[64] = { 0,  1,  8,  16, 9,  2,  3,  10, 17, 24, 32, 25, 18, 11, 4,  5,
				    12, 19, 26, 33, 40, 48, 41, 34, 27, 20, 13, 6,  7,  14, 21, 28,
				    35, 42, 49, 56, 57, 50, 43, 36, 29, 22, 15, 23, 30, 37, 44, 51,
				    58, 59, 52, 45, 38, 31, 39, 46, 53, 60, 61, 54, 47, 55, 62, 63 };


/* How many kept coefficients differ from libjpeg's reading (-1 if the
 * shapes differ). */
long differing_coefficients(const Bytes &file, const Ie_Progressive &ours)
{
	jpeg_decompress_struct cinfo;
	jpeg_error_mgr error;
	cinfo.err = jpeg_std_error(&error);
	jpeg_create_decompress(&cinfo);
	jpeg_mem_src(&cinfo, file.data(), file.size());
	jpeg_read_header(&cinfo, TRUE);
	jvirt_barray_ptr *arrays = jpeg_read_coefficients(&cinfo);
	long differing = cinfo.num_components == ours.components ? 0 : -1;
	for (int c = 0; c < cinfo.num_components && differing >= 0; c++) {
		const jpeg_component_info &comp = cinfo.comp_info[c];
		const Ie_Progressive_Plane &plane = ours.planes[c];
		if (int(comp.width_in_blocks) != plane.used_w || int(comp.height_in_blocks) != plane.used_h) {
			differing = -1;
			break;
		}
		for (int k = 0; k < plane.kept; k++)
			differing += comp.quant_table->quantval[NATURAL_ORDER[k]] != plane.quant[k];
		for (JDIMENSION by = 0; by < comp.height_in_blocks; by++) {
			JBLOCKARRAY row = cinfo.mem->access_virt_barray(reinterpret_cast<j_common_ptr>(&cinfo), arrays[c], by, 1, FALSE);
			for (JDIMENSION bx = 0; bx < comp.width_in_blocks; bx++) {
				const int16_t *kept = plane.coefficients + (size_t(by) * plane.blocks_w + bx) * plane.kept;
				for (int k = 0; k < plane.kept; k++)
					differing += row[0][bx][NATURAL_ORDER[k]] != kept[k];
			}
		}
	}
	jpeg_finish_decompress(&cinfo);
	jpeg_destroy_decompress(&cinfo);
	return differing;
}

Ie_Progressive_Status read_progressive(const Bytes &file, int target_w, int target_h, bool portable, Ie_Progressive *p)
{
	return ie_progressive_read(file.data(), file.size(), target_w, target_h, nullptr, nullptr, p, portable);
}

/* libjpeg's own decoding at scale/8 as BGRA. */
Bytes libjpeg_pixels(const Bytes &file, int scale, int *w, int *h)
{
	jpeg_decompress_struct cinfo;
	jpeg_error_mgr error;
	cinfo.err = jpeg_std_error(&error);
	jpeg_create_decompress(&cinfo);
	jpeg_mem_src(&cinfo, file.data(), file.size());
	jpeg_read_header(&cinfo, TRUE);
	cinfo.scale_num = JDIMENSION(scale);
	cinfo.scale_denom = 8;
	cinfo.out_color_space = JCS_EXT_BGRA;
	jpeg_start_decompress(&cinfo);
	*w = int(cinfo.output_width);
	*h = int(cinfo.output_height);
	Bytes pixels(size_t(*w) * *h * 4);
	while (cinfo.output_scanline < cinfo.output_height) {
		JSAMPROW row = &pixels[size_t(cinfo.output_scanline) * *w * 4];
		jpeg_read_scanlines(&cinfo, &row, 1);
	}
	jpeg_finish_decompress(&cinfo);
	jpeg_destroy_decompress(&cinfo);
	return pixels;
}

double psnr(const Bytes &a, const Bytes &b)
{
	double sum = 0;
	for (size_t i = 0; i < a.size(); i++)
		sum += double(a[i] - b[i]) * (a[i] - b[i]);
	return sum == 0 ? 99.0 : 10 * std::log10(255.0 * 255.0 * double(a.size()) / sum);
}

TEST(ProgressiveJpeg, CoefficientsAreLibjpegsOnEveryShapeScriptAndScale)
{
	const std::pair<int, int> sizes[] = { { 1, 1 }, { 7, 5 }, { 8, 8 }, { 17, 9 }, { 33, 31 }, { 64, 48 }, { 100, 3 } };
	struct Layout {
		int components, h0, v0;
	};
	const Layout layouts[] = { { 3, 2, 2 }, { 3, 1, 1 }, { 3, 2, 1 }, { 3, 1, 2 }, { 1, 1, 1 } };
	int runs = 0;
	for (const auto &size : sizes)
		for (const Layout &layout : layouts)
			for (int variant = 0; variant < 4; variant++) {
				Encoding e;
				e.components = layout.components;
				e.h0 = layout.h0;
				e.v0 = layout.v0;
				e.quality = variant == 3 ? 100 : variant == 2 ? 50 : 92;
				e.successive = variant != 1;
				e.restart = variant == 2 ? 1 : variant == 3 ? 3 : 0;
				const int noise = variant == 3 ? 40 : 6;
				const Bytes file = encode(test_pixels(size.first, size.second, e.components, uint32_t(size.first * 7 + variant), noise),
							  size.first, size.second, e);
				for (int divisor : { 1, 2, 4, 8 })
					for (int path = 0; path < 4; path++) {
						/* Each bit operation path, on one thread and on two. */
						const bool portable = path & 1;
						const int threads = 1 + (path >> 1);
						iel_thread_count_set(threads);
						const std::string at = std::to_string(threads) + " threads, " + std::to_string(size.first) + "x" + std::to_string(size.second) +
								       " comps " + std::to_string(e.components) + " " +
								       std::to_string(e.h0) + "x" + std::to_string(e.v0) + " variant " +
								       std::to_string(variant) + " /" + std::to_string(divisor) +
								       (portable ? " portable" : "");
						Ie_Progressive p;
						ASSERT_EQ(read_progressive(file, std::max(1, size.first / divisor), std::max(1, size.second / divisor),
									   portable, &p),
							  Ie_Progressive_Status::DONE)
							<< at;
						EXPECT_EQ(differing_coefficients(file, p), 0) << at;
						ie_progressive_free(&p);
						runs++;
					}
			}
	iel_thread_count_set(0);
	EXPECT_EQ(runs, 7 * 5 * 4 * 4 * 4);

	/* Larger pictures have rare symbols, whose codes are longer than the
	 * one-look-up tables hold, and blocks with more corrections than the
	 * bit reader holds at once; each scale keeps a different share. */
	for (int quality : { 100, 30 }) {
		Encoding e;
		e.quality = quality;
		const Bytes file = encode(test_pixels(480, 320, 3, 99, quality == 100 ? 60 : 2), 480, 320, e);
		for (int divisor : { 1, 2, 4, 8 })
			for (bool portable : { false, true }) {
				iel_thread_count_set(portable ? 1 : 2);
				Ie_Progressive p;
				ASSERT_EQ(read_progressive(file, 480 / divisor, 320 / divisor, portable, &p), Ie_Progressive_Status::DONE);
				EXPECT_EQ(differing_coefficients(file, p), 0)
					<< quality << " /" << divisor << (portable ? " portable" : "");
				ie_progressive_free(&p);
			}
	}
	iel_thread_count_set(0);
}

/* Each scale libjpeg's decoding reaches without upsampling, as PSNR: the
 * inverse DCTs differ in their rounding only. */
TEST(ProgressiveJpeg, PixelsAreLibjpegsScaledDecoding)
{
	for (int components : { 3, 1 })
		for (int h0 : { 1, 2 }) {
			Encoding e;
			e.components = components;
			e.h0 = e.v0 = h0;
			const int w = 203, h = 141;
			const Bytes file = encode(test_pixels(w, h, components, 11, 3), w, h, e);
			for (int scale : { 1, 2, 4, 8 }) {
				const std::string at = std::to_string(components) + " comps " + std::to_string(h0) + " sampling, " +
						       std::to_string(scale) + "/8";
				Ie_Progressive p;
				const int out_w = (w * scale + 7) / 8, out_h = (h * scale + 7) / 8;
				ASSERT_EQ(read_progressive(file, out_w, out_h, false, &p), Ie_Progressive_Status::DONE) << at;
				int ours_w = 0, ours_h = 0;
				const bool reachable = ie_progressive_scale_ok(p, &ours_w, &ours_h);
				EXPECT_EQ(reachable, components == 1 || h0 == 1 || scale < 8) << at;
				if (reachable) {
					struct Sink {
						Bytes pixels;
						int w;
					} sink{ {}, ours_w };
					ASSERT_EQ(ie_progressive_render(p,
						  [](void *data, const uint8_t *rows, int count) {
							  auto *s = static_cast<Sink *>(data);
							  s->pixels.insert(s->pixels.end(), rows, rows + size_t(count) * s->w * 4);
						  },
						  &sink, nullptr, nullptr),
						  Ie_Decode_Status::DONE)
						<< at;
					int theirs_w = 0, theirs_h = 0;
					const Bytes theirs = libjpeg_pixels(file, scale, &theirs_w, &theirs_h);
					ASSERT_EQ(ours_w, theirs_w) << at;
					ASSERT_EQ(ours_h, theirs_h) << at;
					ASSERT_EQ(sink.pixels.size(), theirs.size()) << at;
					EXPECT_GT(psnr(sink.pixels, theirs), 38.0) << at;
				}
				ie_progressive_free(&p);
			}
		}
}

/* Baseline and arithmetic-coded files, a damaged scan and a refinement
 * before the first pass of its coefficients are all handed back. */
TEST(ProgressiveJpeg, HandsBackWhatItDoesNotTake)
{
	const int w = 48, h = 40;
	const Bytes pixels = test_pixels(w, h, 3, 5, 6);
	Encoding baseline;
	baseline.progressive = false;
	Encoding arithmetic;
	arithmetic.arithmetic = true;
	Ie_Progressive p;
	for (const Encoding &e : { baseline, arithmetic }) {
		EXPECT_EQ(read_progressive(encode(pixels, w, h, e), w, h, false, &p), Ie_Progressive_Status::NOT_OURS);
		ie_progressive_free(&p);
	}

	Bytes file = encode(pixels, w, h, Encoding());
	/* The first scan's header: drop the DC pass's successive approximation
	 * claim so that the next refinement no longer follows on. */
	size_t sos = 0;
	for (size_t i = 2; i + 1 < file.size(); i++)
		if (file[i] == 0xFF && file[i + 1] == 0xDA) {
			sos = i;
			break;
		}
	ASSERT_GT(sos, 0u);
	Bytes bogus = file;
	const size_t approximation = sos + 4 + 1 + 2 * bogus[sos + 4] + 2;
	ASSERT_EQ(bogus[approximation], 0x01) << "libjpeg's script: DC first with one bit held back";
	bogus[approximation] = 0x00;
	EXPECT_EQ(read_progressive(bogus, w, h, false, &p), Ie_Progressive_Status::NOT_OURS);
	ie_progressive_free(&p);

	/* A code no table holds: all ones where the data starts. */
	Bytes damaged = file;
	const size_t data = sos + 2 + (size_t(file[sos + 2]) << 8 | file[sos + 3]);
	damaged[data] = 0xFF;
	damaged[data + 1] = 0x00;
	damaged[data + 2] = 0xFF;
	damaged[data + 3] = 0x00;
	EXPECT_EQ(read_progressive(damaged, w, h, false, &p), Ie_Progressive_Status::NOT_OURS);
	ie_progressive_free(&p);

	/* Cut in the middle: the decoding would run on past the data. */
	Bytes cut(file.begin(), file.begin() + long(file.size() / 2));
	cut.insert(cut.end(), { 0xFF, 0xD9 });
	EXPECT_EQ(read_progressive(cut, w, h, false, &p), Ie_Progressive_Status::NOT_OURS);
	ie_progressive_free(&p);
}

/* A file that holds nothing but one Huffman table: `per_length` codes of
 * each length from 1 to `lengths`. */
Bytes huffman_table_only(int lengths, int per_length)
{
	const int total = lengths * per_length;
	const int length = 2 + 17 + total;
	Bytes file = { 0xFF, 0xD8, 0xFF, 0xC4, uint8_t(length >> 8), uint8_t(length), 0x10 };
	for (int len = 1; len <= 16; len++)
		file.push_back(uint8_t(len <= lengths ? per_length : 0));
	for (int i = 0; i < total; i++)
		file.push_back(uint8_t(i));
	file.insert(file.end(), { 0xFF, 0xD9 });
	return file;
}

/* Hostile tables: more codes of a length than it has (255 one-bit codes
 * would index the look-up table far past its end), or a code of all
 * ones. Refused before anything is written. */
TEST(ProgressiveJpeg, RefusesOverfullHuffmanTables)
{
	Ie_Progressive p;
	for (const auto &[lengths, per_length] : { std::pair{ 1, 255 }, std::pair{ 1, 3 }, std::pair{ 1, 2 },
						     std::pair{ 8, 2 }, std::pair{ 12, 21 } }) {
		EXPECT_EQ(read_progressive(huffman_table_only(lengths, per_length), 8, 8, false, &p),
			  Ie_Progressive_Status::NOT_OURS)
			<< lengths << " lengths of " << per_length;
		ie_progressive_free(&p);
	}
}

/* A grey progressive JPEG of w x h whose only scan is the DC one, every
 * block's difference +2047: the running DC sum passes INT_MAX after about
 * a million blocks. */
Bytes dc_climbing_jpeg(int w, int h)
{
	Bytes file = { 0xFF, 0xD8, 0xFF, 0xDB, 0, 67, 0 };
	file.insert(file.end(), 64, 1);
	file.insert(file.end(), { 0xFF, 0xC2, 0, 11, 8, uint8_t(h >> 8), uint8_t(h), uint8_t(w >> 8), uint8_t(w), 1, 1,
				  0x11, 0 });
	/* One DC code, "0", for a difference of 11 bits. */
	file.insert(file.end(), { 0xFF, 0xC4, 0, 20, 0x00, 1 });
	file.insert(file.end(), 15, 0);
	file.push_back(11);
	file.insert(file.end(), { 0xFF, 0xDA, 0, 8, 1, 1, 0x00, 0, 0, 0 });
	uint32_t bits = 0;
	int count = 0;
	auto put = [&](uint32_t value, int n) {
		bits = bits << n | value;
		for (count += n; count >= 8; count -= 8) {
			file.push_back(uint8_t(bits >> (count - 8)));
			if (file.back() == 0xFF)
				file.push_back(0x00);
		}
	};
	const long blocks = long((w + 7) / 8) * ((h + 7) / 8);
	for (long i = 0; i < blocks; i++)
		put(2047, 12);
	if (count)
		put((1u << (8 - count)) - 1, 8 - count);
	file.insert(file.end(), { 0xFF, 0xD9 });
	return file;
}

/* A DC sum past int is damage, as libjpeg has it, not a wrapped value. */
TEST(ProgressiveJpeg, RefusesADcSumPastInt)
{
	Ie_Progressive p;
	const Bytes within = dc_climbing_jpeg(64, 64);
	EXPECT_EQ(read_progressive(within, 8, 8, false, &p), Ie_Progressive_Status::DONE);
	ie_progressive_free(&p);
	const Bytes past = dc_climbing_jpeg(8200, 8200);
	EXPECT_EQ(read_progressive(past, 8, 8, false, &p), Ie_Progressive_Status::NOT_OURS);
	ie_progressive_free(&p);
	Ie_Decoded out;
	EXPECT_EQ(ie_image_decode(past.data(), past.size(), 64, 64, nullptr, nullptr, &out), Ie_Decode_Status::FAILED);
	free(out.pixels);
}

/* The quarter-size inverse DCT at the extremes a file can hold (16-bit
 * quantisers of 65535, coefficients of 32767): the sums of four products
 * pass int, and must clamp as the value they are. */
TEST(ProgressiveJpeg, QuarterScaleSumsDoNotWrap)
{
	Ie_Progressive p = {};
	p.width = p.height = 8;
	p.components = 1;
	p.hmax = p.vmax = p.mcus_x = p.mcus_y = 1;
	p.scale = 2;
	Ie_Progressive_Plane &plane = p.planes[0];
	plane.h = plane.v = plane.blocks_w = plane.blocks_h = plane.used_w = plane.used_h = 1;
	plane.kept = 5;
	int16_t coefficients[5] = { 32767, 32767, 32767, 0, 32767 };
	plane.coefficients = coefficients;
	std::fill(std::begin(plane.quant), std::end(plane.quant), uint16_t(65535));
	Bytes rows;
	auto take = [](void *data, const uint8_t *from, int count) {
		static_cast<Bytes *>(data)->insert(static_cast<Bytes *>(data)->end(), from, from + 2 * 4 * count);
	};
	ASSERT_EQ(ie_progressive_render(p, take, &rows, nullptr, nullptr), Ie_Decode_Status::DONE);
	ASSERT_EQ(rows.size(), 16u);
	/* Top left: all four add up (white); the others cancel (mid grey). */
	EXPECT_EQ(rows[0], 255);
	for (int pixel = 1; pixel < 4; pixel++)
		EXPECT_EQ(rows[size_t(pixel) * 4], 128) << pixel;
}

/* The first frame header of a JPEG made to claim w x h. */
Bytes jpeg_claiming(Bytes file, int w, int h)
{
	size_t sof = 2;
	while (file[sof + 1] != 0xC0 && file[sof + 1] != 0xC2)
		sof += 2 + (size_t(file[sof + 2]) << 8 | file[sof + 3]);
	file[sof + 5] = uint8_t(h >> 8);
	file[sof + 6] = uint8_t(h);
	file[sof + 7] = uint8_t(w >> 8);
	file[sof + 8] = uint8_t(w);
	return file;
}

/* ---- PNG ---- */

struct Png_Options {
	int colour = PNG_COLOR_TYPE_RGB;
	int depth = 8;
	int filters = PNG_ALL_FILTERS;
	bool interlace = false;
	bool transparent_colour = false;
	size_t idat_size = 8192; /* image data split into chunks of this */
};

/* `pixels`: as many bytes a sample as the depth needs, samples as the
 * colour kind has them. */
Bytes write_png(const Bytes &pixels, int w, int h, const Png_Options &o)
{
	Bytes file;
	png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
	png_infop info = png_create_info_struct(png);
	png_set_write_fn(png, &file,
			 [](png_structp p, png_bytep data, png_size_t n) {
				 auto *out = static_cast<Bytes *>(png_get_io_ptr(p));
				 out->insert(out->end(), data, data + n);
			 },
			 nullptr);
	png_set_compression_buffer_size(png, o.idat_size);
	png_set_IHDR(png, info, png_uint_32(w), png_uint_32(h), o.depth, o.colour,
		     o.interlace ? PNG_INTERLACE_ADAM7 : PNG_INTERLACE_NONE, PNG_COMPRESSION_TYPE_DEFAULT,
		     PNG_FILTER_TYPE_DEFAULT);
	png_set_filter(png, 0, o.filters);
	png_color palette[2] = { { 10, 20, 30 }, { 200, 100, 50 } };
	if (o.colour == PNG_COLOR_TYPE_PALETTE)
		png_set_PLTE(png, info, palette, 2);
	png_color_16 transparent = {};
	if (o.transparent_colour)
		png_set_tRNS(png, info, nullptr, 0, &transparent);
	png_write_info(png, info);
	const int channels = png_get_channels(png, info);
	const size_t row = size_t(w) * channels * (o.depth / 8 ? o.depth / 8 : 1);
	const int passes = png_set_interlace_handling(png);
	for (int pass = 0; pass < passes; pass++)
		for (int y = 0; y < h; y++)
			png_write_row(png, const_cast<png_bytep>(&pixels[size_t(y) * row]));
	png_write_end(png, info);
	png_destroy_write_struct(&png, &info);
	return file;
}

/* libpng's rows with the loader's transforms, premultiplied as the loader
 * does: the reference for ours. */
Bytes libpng_rows(const Bytes &file, int *w, int *h)
{
	struct Reader {
		const Bytes *file;
		size_t pos;
	} reader{ &file, 0 };
	png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
	png_infop info = png_create_info_struct(png);
	png_set_read_fn(png, &reader, [](png_structp p, png_bytep to, png_size_t n) {
		auto *r = static_cast<Reader *>(png_get_io_ptr(p));
		memcpy(to, r->file->data() + r->pos, n);
		r->pos += n;
	});
	png_read_info(png, info);
	*w = int(png_get_image_width(png, info));
	*h = int(png_get_image_height(png, info));
	const int colour = png_get_color_type(png, info);
	const bool alpha = colour & PNG_COLOR_MASK_ALPHA;
	if (!(colour & PNG_COLOR_MASK_COLOR))
		png_set_gray_to_rgb(png);
	png_set_bgr(png);
	if (!alpha)
		png_set_filler(png, 0xFF, PNG_FILLER_AFTER);
	png_read_update_info(png, info);
	Bytes pixels(size_t(*w) * *h * 4);
	for (int y = 0; y < *h; y++)
		png_read_row(png, &pixels[size_t(y) * *w * 4], nullptr);
	png_destroy_read_struct(&png, &info, nullptr);
	for (size_t i = 0; alpha && i < pixels.size(); i += 4)
		for (int c = 0; c < 3; c++)
			pixels[i + c] = uint8_t((pixels[i + c] * (pixels[i + 3] + 1u)) >> 8);
	return pixels;
}

struct Png_Sink {
	Bytes pixels;
	int w;
};

Ie_Png_Status our_png_rows(const Bytes &file, Png_Sink *sink)
{
	return ie_png_decode(
		file.data(), file.size(),
		[](void *data, const uint8_t *rows, int count) {
			auto *s = static_cast<Png_Sink *>(data);
			s->pixels.insert(s->pixels.end(), rows, rows + size_t(count) * s->w * 4);
		},
		sink, nullptr, nullptr);
}

TEST(PngUnfilter, FastPathIsTheReference)
{
	std::mt19937 rng(3);
	for (int bpp = 1; bpp <= 4; bpp++)
		for (int type = 0; type <= 4; type++)
			for (size_t pixels = 1; pixels <= 40; pixels++)
				for (bool first_row : { false, true }) {
					const size_t length = pixels * size_t(bpp);
					Bytes prior(length), row(length + 16, 0xA5);
					for (uint8_t &b : prior)
						b = uint8_t(rng());
					for (size_t i = 0; i < length; i++)
						row[i] = uint8_t(rng());
					Bytes want = row, got = row;
					const uint8_t *above = first_row ? nullptr : prior.data();
					ASSERT_TRUE(ie_png_unfilter_reference(type, want.data(), above, length, bpp));
					ASSERT_TRUE(ie_png_unfilter(type, got.data(), above, length, bpp));
					ASSERT_EQ(got, want) << "bpp " << bpp << " filter " << type << " pixels " << pixels
							     << (first_row ? " first row" : "");
				}
	Bytes row(8);
	EXPECT_FALSE(ie_png_unfilter(5, row.data(), nullptr, row.size(), 4));
	EXPECT_FALSE(ie_png_unfilter_reference(5, row.data(), nullptr, row.size(), 4));
}

TEST(PngDecode, RowsAreLibpngsForEveryKindFilterAndSplit)
{
	const int colours[] = { PNG_COLOR_TYPE_GRAY, PNG_COLOR_TYPE_GRAY_ALPHA, PNG_COLOR_TYPE_RGB, PNG_COLOR_TYPE_RGB_ALPHA };
	const int filters[] = { PNG_FILTER_NONE, PNG_FILTER_SUB, PNG_FILTER_UP, PNG_FILTER_AVG, PNG_FILTER_PAETH, PNG_ALL_FILTERS };
	const std::pair<int, int> sizes[] = { { 1, 1 }, { 5, 3 }, { 33, 17 }, { 70, 41 } };
	for (int colour : colours)
		for (int filter : filters)
			for (const auto &size : sizes) {
				Png_Options o;
				o.colour = colour;
				o.filters = filter;
				o.idat_size = size.first == 70 ? 64 : 8192;
				const int channels = colour == PNG_COLOR_TYPE_GRAY ? 1 : colour == PNG_COLOR_TYPE_GRAY_ALPHA ? 2 : colour == PNG_COLOR_TYPE_RGB ? 3 : 4;
				const Bytes file = write_png(test_pixels(size.first, size.second, channels, uint32_t(size.first + colour), 20),
							     size.first, size.second, o);
				const std::string at = "colour " + std::to_string(colour) + " filter " + std::to_string(filter) + " " +
						       std::to_string(size.first) + "x" + std::to_string(size.second);
				int w = 0, h = 0;
				bool alpha = false;
				ASSERT_TRUE(ie_png_probe(file.data(), file.size(), &w, &h, &alpha)) << at;
				EXPECT_EQ(alpha, bool(colour & PNG_COLOR_MASK_ALPHA)) << at;
				int lw = 0, lh = 0;
				const Bytes theirs = libpng_rows(file, &lw, &lh);
				/* On one thread, and inflating on a second. */
				for (int threads : { 1, 2 }) {
					iel_thread_count_set(threads);
					Png_Sink sink{ {}, w };
					ASSERT_EQ(our_png_rows(file, &sink), Ie_Png_Status::DONE) << at << ", " << threads << " threads";
					EXPECT_TRUE(sink.pixels == theirs) << at << ", " << threads << " threads";
				}
				iel_thread_count_set(0);
			}
}

/* Palette, 16 bits, interlacing and a transparent colour are libpng's;
 * a wrong CRC, damaged or short image data are refused, for libpng to
 * decide on. */
TEST(PngDecode, HandsBackWhatItDoesNotTake)
{
	const int w = 24, h = 10;
	auto refused = [](const Bytes &file) {
		int pw, ph;
		bool alpha;
		Png_Sink sink{ {}, 24 };
		return !ie_png_probe(file.data(), file.size(), &pw, &ph, &alpha) || our_png_rows(file, &sink) == Ie_Png_Status::NOT_OURS;
	};
	Png_Options palette;
	palette.colour = PNG_COLOR_TYPE_PALETTE;
	Bytes indices(size_t(w) * h);
	for (size_t i = 0; i < indices.size(); i++)
		indices[i] = uint8_t(i % 2);
	EXPECT_TRUE(refused(write_png(indices, w, h, palette)));
	Png_Options deep;
	deep.depth = 16;
	EXPECT_TRUE(refused(write_png(test_pixels(w * 2, h, 3, 1, 5), w, h, deep)));
	Png_Options interlaced;
	interlaced.interlace = true;
	EXPECT_TRUE(refused(write_png(test_pixels(w, h, 3, 1, 5), w, h, interlaced)));
	Png_Options transparent;
	transparent.transparent_colour = true;
	EXPECT_TRUE(refused(write_png(test_pixels(w, h, 3, 1, 5), w, h, transparent)));

	const Bytes good = write_png(test_pixels(w, h, 3, 1, 5), w, h, Png_Options());
	ASSERT_FALSE(refused(good));
	/* The first IDAT: its length, type and data. */
	size_t idat = 8;
	while (memcmp(&good[idat + 4], "IDAT", 4) != 0)
		idat += 12 + (size_t(good[idat]) << 24 | good[idat + 1] << 16 | good[idat + 2] << 8 | good[idat + 3]);
	const size_t length = size_t(good[idat + 2]) << 8 | good[idat + 3];
	Bytes bad_crc = good;
	bad_crc[idat + 8 + length / 2] ^= 0x10;
	EXPECT_TRUE(refused(bad_crc));
	/* Damaged and short data, with the CRC made right again. */
	auto recrc = [&](Bytes file) {
		const uint32_t crc = crc32_gzip_refl(0, &file[idat + 4], length + 4);
		for (int i = 0; i < 4; i++)
			file[idat + 8 + length + i] = uint8_t(crc >> (24 - 8 * i));
		return file;
	};
	Bytes damaged = bad_crc;
	EXPECT_TRUE(refused(recrc(damaged)));
	Bytes short_data = good;
	for (size_t i = length / 2; i < length; i++)
		short_data[idat + 8 + i] = 0;
	EXPECT_TRUE(refused(recrc(short_data)));

	/* The same when inflating on a second thread: the damage is found
	 * there, in a later strip. */
	iel_thread_count_set(2);
	const Bytes tall = write_png(test_pixels(w, 200, 3, 1, 5), w, 200, Png_Options());
	ASSERT_FALSE(refused(tall));
	Bytes tall_damaged = tall;
	tall_damaged.resize(tall.size() - 40);
	tall_damaged.insert(tall_damaged.end(), tall.end() - 12, tall.end());
	EXPECT_TRUE(refused(tall_damaged));
	iel_thread_count_set(0);
}

/* A header may claim any size; past the editor's limit (ie-image-decode.h)
 * a picture is refused by every probe and decoder before anything is
 * allocated (a PNG 16 million pixels wide had our decoder ask for 1.8 GB
 * of row buffers, a 20000 x 18000 JPEG had libjpeg hold gigabytes of
 * coefficients). Just within it, the probes still take it. */
TEST(DecodeLimits, PicturesPastTheSizeLimitAreRefusedBeforeAnyDecoding)
{
	auto png_claiming = [](Bytes file, uint32_t w, uint32_t h) {
		for (int i = 0; i < 4; i++) {
			file[16 + size_t(i)] = uint8_t(w >> (24 - 8 * i));
			file[20 + size_t(i)] = uint8_t(h >> (24 - 8 * i));
		}
		const uint32_t crc = crc32_gzip_refl(0, &file[12], 17);
		for (int i = 0; i < 4; i++)
			file[29 + size_t(i)] = uint8_t(crc >> (24 - 8 * i));
		return file;
	};
	const Bytes png = write_png(test_pixels(8, 8, 3, 1, 5), 8, 8, Png_Options());
	const Bytes jpeg = encode(test_pixels(16, 16, 3, 2, 5), 16, 16, Encoding());
	struct Claim {
		int w, h;
		bool taken;
	};
	for (const Claim &c : { Claim{ 16777216, 1, false }, Claim{ 65001, 2, false }, Claim{ 2, 65001, false },
				Claim{ 12000, 12000, false }, Claim{ 20036, 18757, false }, Claim{ 16384, 8192, true },
				Claim{ 65000, 2000, true } }) {
		SCOPED_TRACE(std::to_string(c.w) + " x " + std::to_string(c.h));
		const Bytes claims_png = png_claiming(png, uint32_t(c.w), uint32_t(c.h));
		int w = 0, h = 0;
		bool alpha;
		EXPECT_EQ(ie_png_probe(claims_png.data(), claims_png.size(), &w, &h, &alpha), c.taken);
		EXPECT_EQ(ie_image_decode_probe(claims_png.data(), claims_png.size(), &w, &h), c.taken);
		Ie_Decoded out;
		EXPECT_NE(ie_image_decode(claims_png.data(), claims_png.size(), 64, 64, nullptr, nullptr, &out),
			  Ie_Decode_Status::DONE);
		if (c.w > 65500)
			continue; /* a JPEG side has 16 bits */
		const Bytes claims_jpeg = jpeg_claiming(jpeg, c.w, c.h);
		EXPECT_EQ(ie_image_decode_probe(claims_jpeg.data(), claims_jpeg.size(), &w, &h), c.taken);
		Ie_Progressive p;
		EXPECT_EQ(read_progressive(claims_jpeg, 64, 64, false, &p), Ie_Progressive_Status::NOT_OURS);
		ie_progressive_free(&p);
		if (!c.taken) {
			EXPECT_EQ(ie_image_decode(claims_jpeg.data(), claims_jpeg.size(), 64, 64, nullptr, nullptr, &out),
				  Ie_Decode_Status::FAILED);
		}
	}
}

} // namespace
