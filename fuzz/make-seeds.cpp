/* Writes the fuzz targets' seed pictures into a folder: baseline and
 * progressive JPEG at several sizes and samplings (some with restart
 * intervals), JPEG with EXIF in both byte orders (after a comment too) and
 * with a colour profile, and PNG of every colour type, bit depth and
 * interlacing. All made here from a drawn pattern. */
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include <jpeglib.h>
#include <png.h>

namespace {

using Bytes = std::vector<uint8_t>;

std::string folder;
int written = 0;

void save(const std::string &name, const Bytes &bytes)
{
	FILE *file = fopen((folder + "/" + name).c_str(), "wb");
	if (!file || fwrite(bytes.data(), 1, bytes.size(), file) != bytes.size() || fclose(file) != 0) {
		perror(name.c_str());
		return;
	}
	written++;
}

uint8_t pattern(int x, int y, int c)
{
	return uint8_t(x * 37 + y * 11 + c * 80 + ((x ^ y) & 8) * 12);
}

/* TIFF data after "Exif\0\0": IFD0 with the orientation, a maker and a
 * date, in either byte order. */
Bytes exif_block(int orientation, bool big_endian)
{
	Bytes b = { 'E', 'x', 'i', 'f', 0, 0 };
	auto u16 = [&](unsigned v) {
		b.push_back(uint8_t(big_endian ? v >> 8 : v));
		b.push_back(uint8_t(big_endian ? v : v >> 8));
	};
	auto u32 = [&](uint32_t v) {
		for (int i = 0; i < 4; i++)
			b.push_back(uint8_t(v >> (big_endian ? 24 - 8 * i : 8 * i)));
	};
	b.push_back(big_endian ? 'M' : 'I');
	b.push_back(big_endian ? 'M' : 'I');
	u16(42);
	u32(8);
	u16(3);
	u16(0x010F); u16(2); u32(4); b.insert(b.end(), { 'i', 'e', 0, 0 });       /* Make */
	u16(0x0112); u16(3); u32(1); u16(unsigned(orientation)); u16(0);          /* Orientation */
	u16(0x0132); u16(2); u32(20); u32(8 + 2 + 3 * 12 + 4);                    /* DateTime */
	u32(0);
	const char date[20] = "2026:01:02 03:04:05";
	b.insert(b.end(), date, date + 20);
	return b;
}

Bytes icc_block()
{
	Bytes b = { 'I', 'C', 'C', '_', 'P', 'R', 'O', 'F', 'I', 'L', 'E', 0, 1, 1 };
	for (int i = 0; i < 128; i++)
		b.push_back(uint8_t(i * 7));
	return b;
}

struct Jpeg_Options {
	int w, h, components;
	int h0, v0;	/* luma sampling; chroma is 1x1 */
	bool progressive;
	int restart_rows;
	std::vector<std::pair<int, Bytes>> markers;
};

Bytes jpeg(const Jpeg_Options &o)
{
	jpeg_compress_struct cinfo;
	jpeg_error_mgr err;
	cinfo.err = jpeg_std_error(&err);
	jpeg_create_compress(&cinfo);
	unsigned char *out = nullptr;
	unsigned long out_size = 0;
	jpeg_mem_dest(&cinfo, &out, &out_size);
	cinfo.image_width = JDIMENSION(o.w);
	cinfo.image_height = JDIMENSION(o.h);
	cinfo.input_components = o.components;
	cinfo.in_color_space = o.components == 1 ? JCS_GRAYSCALE : JCS_RGB;
	jpeg_set_defaults(&cinfo);
	jpeg_set_quality(&cinfo, 90, TRUE);
	cinfo.comp_info[0].h_samp_factor = o.h0;
	cinfo.comp_info[0].v_samp_factor = o.v0;
	for (int c = 1; c < o.components; c++)
		cinfo.comp_info[c].h_samp_factor = cinfo.comp_info[c].v_samp_factor = 1;
	cinfo.restart_in_rows = o.restart_rows;
	if (o.progressive)
		jpeg_simple_progression(&cinfo);
	jpeg_start_compress(&cinfo, TRUE);
	for (const auto &m : o.markers)
		jpeg_write_marker(&cinfo, m.first, m.second.data(), unsigned(m.second.size()));
	std::vector<uint8_t> row(size_t(o.w) * size_t(o.components));
	while (cinfo.next_scanline < cinfo.image_height) {
		for (int x = 0; x < o.w; x++)
			for (int c = 0; c < o.components; c++)
				row[size_t(x * o.components + c)] = pattern(x, int(cinfo.next_scanline), c);
		JSAMPROW rows[] = { row.data() };
		jpeg_write_scanlines(&cinfo, rows, 1);
	}
	jpeg_finish_compress(&cinfo);
	jpeg_destroy_compress(&cinfo);
	Bytes bytes(out, out + out_size);
	free(out);
	return bytes;
}

void png_write_bytes(png_structp png, png_bytep data, png_size_t size)
{
	auto *b = static_cast<Bytes *>(png_get_io_ptr(png));
	b->insert(b->end(), data, data + size);
}

void png_flush_nothing(png_structp) {}

Bytes png(int w, int h, int colour, int depth, bool interlaced)
{
	Bytes bytes;
	png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
	png_infop info = png_create_info_struct(png);
	if (setjmp(png_jmpbuf(png))) {
		png_destroy_write_struct(&png, &info);
		return {};
	}
	png_set_write_fn(png, &bytes, png_write_bytes, png_flush_nothing);
	png_set_IHDR(png, info, png_uint_32(w), png_uint_32(h), depth, colour,
		     interlaced ? PNG_INTERLACE_ADAM7 : PNG_INTERLACE_NONE, PNG_COMPRESSION_TYPE_DEFAULT,
		     PNG_FILTER_TYPE_DEFAULT);
	if (colour == PNG_COLOR_TYPE_PALETTE) {
		png_color palette[256];
		for (int i = 0; i < 256; i++)
			palette[i] = { uint8_t(i), uint8_t(255 - i), uint8_t(i * 3) };
		const int entries = 1 << depth;
		png_set_PLTE(png, info, palette, entries);
		png_byte alpha[4] = { 0, 128, 255, 64 };
		png_set_tRNS(png, info, alpha, 4 < entries ? 4 : entries, nullptr);
	} else if ((colour == PNG_COLOR_TYPE_GRAY || colour == PNG_COLOR_TYPE_RGB) && w == 13) {
		/* A transparent colour on some: the others are the kinds our own
		 * decoding takes. */
		png_color_16 transparent = {};
		transparent.gray = transparent.red = uint16_t(1);
		png_set_tRNS(png, info, nullptr, 0, &transparent);
	}
	png_write_info(png, info);
	const int channels = png_get_channels(png, info);
	const size_t row_bytes = png_get_rowbytes(png, info);
	std::vector<Bytes> rows(size_t(h), Bytes(row_bytes, 0));
	std::vector<png_bytep> pointers;
	for (int y = 0; y < h; y++) {
		for (size_t i = 0; i < row_bytes; i++)
			rows[size_t(y)][i] = pattern(int(i) / channels, y, int(i) % channels);
		pointers.push_back(rows[size_t(y)].data());
	}
	png_write_image(png, pointers.data());
	png_write_end(png, info);
	png_destroy_write_struct(&png, &info);
	return bytes;
}

} // namespace

int main(int argc, char **argv)
{
	if (argc != 2) {
		fprintf(stderr, "usage: %s folder\n", argv[0]);
		return 2;
	}
	folder = argv[1];

	const int sizes[][2] = { { 1, 1 }, { 7, 5 }, { 16, 16 }, { 33, 17 }, { 80, 61 } };
	const struct {
		const char *name;
		int components, h0, v0;
	} samplings[] = { { "grey", 1, 1, 1 }, { "444", 3, 1, 1 }, { "422", 3, 2, 1 }, { "420", 3, 2, 2 },
			  { "440", 3, 1, 2 } };
	for (const auto &size : sizes)
		for (const auto &s : samplings)
			for (int progressive = 0; progressive < 2; progressive++) {
				const std::string name = std::string(progressive ? "progressive-" : "baseline-") + s.name + "-" +
							 std::to_string(size[0]) + "x" + std::to_string(size[1]);
				save(name + ".jpg", jpeg({ size[0], size[1], s.components, s.h0, s.v0, progressive != 0, 0, {} }));
				if (size[0] > 16)
					save(name + "-restarts.jpg",
					     jpeg({ size[0], size[1], s.components, s.h0, s.v0, progressive != 0, 1, {} }));
			}
	for (int big_endian = 0; big_endian < 2; big_endian++)
		for (int orientation : { 1, 6, 8 }) {
			const std::string name = std::string("exif-") + (big_endian ? "be-" : "le-") + std::to_string(orientation);
			const Bytes exif = exif_block(orientation, big_endian != 0);
			const Bytes comment = { 'h', 'i' };
			save(name + ".jpg", jpeg({ 24, 16, 3, 2, 2, orientation == 8, 0, { { JPEG_APP0 + 1, exif } } }));
			save(name + "-after-comment.jpg",
			     jpeg({ 24, 16, 3, 2, 1, false, 0, { { JPEG_COM, comment }, { JPEG_APP0 + 1, exif } } }));
		}
	save("exif-icc.jpg", jpeg({ 24, 16, 3, 2, 2, true, 0,
				    { { JPEG_APP0 + 1, exif_block(3, true) }, { JPEG_APP0 + 2, icc_block() } } }));

	const struct {
		int colour;
		std::vector<int> depths;
	} kinds[] = { { PNG_COLOR_TYPE_GRAY, { 1, 2, 4, 8, 16 } }, { PNG_COLOR_TYPE_RGB, { 8, 16 } },
		      { PNG_COLOR_TYPE_PALETTE, { 1, 2, 4, 8 } }, { PNG_COLOR_TYPE_GRAY_ALPHA, { 8, 16 } },
		      { PNG_COLOR_TYPE_RGB_ALPHA, { 8, 16 } } };
	for (const auto &kind : kinds)
		for (int depth : kind.depths)
			for (int interlaced = 0; interlaced < 2; interlaced++)
				for (const auto &size : { std::make_pair(1, 1), std::make_pair(13, 7), std::make_pair(40, 37) }) {
					const std::string name = "png-" + std::to_string(kind.colour) + "-" + std::to_string(depth) +
								 (interlaced ? "-adam7-" : "-") + std::to_string(size.first) + "x" +
								 std::to_string(size.second) + ".png";
					save(name, png(size.first, size.second, kind.colour, depth, interlaced != 0));
				}
	printf("%d seed pictures in %s\n", written, folder.c_str());
	return 0;
}
