#include "ie-test-pictures.h"

#include <Ecore_Evas.h>
#include <libexif/exif-data.h>

#include <cstdio>

#include <jpeglib.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <fstream>
#include <iterator>

#include "ie-test-harness.h"

namespace iet {

namespace {

uint32_t be32(const uint8_t *p)
{
	return uint32_t(p[0]) << 24 | uint32_t(p[1]) << 16 | uint32_t(p[2]) << 8 | p[3];
}

void put_be32(Bytes &out, uint32_t v)
{
	for (int shift : { 24, 16, 8, 0 })
		out.push_back(uint8_t(v >> shift));
}

uint32_t png_crc(const uint8_t *data, size_t size)
{
	uint32_t crc = 0xFFFFFFFFu;
	for (size_t i = 0; i < size; i++) {
		crc ^= data[i];
		for (int bit = 0; bit < 8; bit++)
			crc = (crc >> 1) ^ (0xEDB88320u & (0u - (crc & 1u)));
	}
	return ~crc;
}

void put_png_chunk(Bytes &out, const char *type, const uint8_t *data, size_t size)
{
	put_be32(out, uint32_t(size));
	Bytes typed = { uint8_t(type[0]), uint8_t(type[1]), uint8_t(type[2]), uint8_t(type[3]) };
	if (size)
		typed.insert(typed.end(), data, data + size);
	out.insert(out.end(), typed.begin(), typed.end());
	put_be32(out, png_crc(typed.data(), typed.size()));
}

/* A JPEG segment: its marker, its length, its body. */
Bytes jpeg_segment(uint8_t marker, const uint8_t *body, size_t size)
{
	Bytes segment(4 + size);
	segment[0] = 0xFF;
	segment[1] = marker;
	segment[2] = uint8_t((size + 2) >> 8);
	segment[3] = uint8_t(size + 2);
	std::copy(body, body + size, segment.begin() + 4);
	return segment;
}

} // namespace

Bytes read_bytes(const std::string &path)
{
	std::ifstream in(path, std::ios::binary);
	return Bytes(std::istreambuf_iterator<char>(in), {});
}

bool write_bytes(const std::string &path, const Bytes &bytes)
{
	std::ofstream out(path, std::ios::binary);
	return bool(out.write(reinterpret_cast<const char *>(bytes.data()), std::streamsize(bytes.size())));
}

Bytes exif_segment(int orientation, bool big_endian)
{
	const ExifByteOrder order = big_endian ? EXIF_BYTE_ORDER_MOTOROLA : EXIF_BYTE_ORDER_INTEL;
	ExifData *exif = exif_data_new();
	exif_data_set_byte_order(exif, order);
	ExifEntry *entry = exif_entry_new();
	exif_content_add_entry(exif->ifd[EXIF_IFD_0], entry);
	exif_entry_initialize(entry, EXIF_TAG_ORIENTATION);
	exif_set_short(entry->data, order, ExifShort(orientation));
	exif_entry_unref(entry);
	unsigned char *block = nullptr;
	unsigned int size = 0;
	exif_data_save_data(exif, &block, &size);
	exif_data_unref(exif);
	Bytes segment = jpeg_segment(0xE1, block, size);
	free(block);
	return segment;
}

Bytes comment_segment(const std::string &text)
{
	return jpeg_segment(0xFE, reinterpret_cast<const uint8_t *>(text.data()), text.size());
}

Bytes jpeg_with_segments(const Bytes &jpeg, const std::vector<Bytes> &segments, bool after_jfif)
{
	size_t at = 2;
	if (after_jfif && jpeg.size() > 6 && jpeg[2] == 0xFF && jpeg[3] == 0xE0)
		at = 4 + (size_t(jpeg[4]) << 8 | jpeg[5]);
	Bytes out(jpeg.begin(), jpeg.begin() + std::min(at, jpeg.size()));
	for (const Bytes &segment : segments)
		out.insert(out.end(), segment.begin(), segment.end());
	out.insert(out.end(), jpeg.begin() + std::min(at, jpeg.size()), jpeg.end());
	return out;
}

bool write_oriented_jpeg(const std::string &path, int w, int h, int orientation, bool big_endian,
			 bool comment_first, bool progressive)
{
	if (!(progressive ? write_progressive_jpeg(path, w, h) : write_picture(path, w, h, "quality=95")))
		return false;
	Bytes exif = exif_segment(orientation, big_endian);
	std::vector<Bytes> segments = comment_first ? std::vector<Bytes>{ comment_segment("Made in a test"), exif }
						    : std::vector<Bytes>{ exif };
	return write_bytes(path, jpeg_with_segments(read_bytes(path), segments, comment_first));
}

bool write_progressive_jpeg(const std::string &path, int w, int h)
{
	const std::string plain = path + ".png";
	if (!write_picture(plain, w, h))
		return false;
	const Pixels pixels = stored_pixels(plain);
	std::remove(plain.c_str());
	FILE *file = pixels.data.empty() ? nullptr : fopen(path.c_str(), "wb");
	if (!file)
		return false;
	jpeg_compress_struct cinfo;
	jpeg_error_mgr error;
	cinfo.err = jpeg_std_error(&error);
	jpeg_create_compress(&cinfo);
	jpeg_stdio_dest(&cinfo, file);
	cinfo.image_width = JDIMENSION(w);
	cinfo.image_height = JDIMENSION(h);
	cinfo.input_components = 4;
	cinfo.in_color_space = JCS_EXT_BGRX;
	jpeg_set_defaults(&cinfo);
	jpeg_set_quality(&cinfo, 95, TRUE);
	jpeg_simple_progression(&cinfo);
	jpeg_start_compress(&cinfo, TRUE);
	while (cinfo.next_scanline < cinfo.image_height) {
		auto *row = reinterpret_cast<JSAMPLE *>(const_cast<uint32_t *>(&pixels.data[size_t(cinfo.next_scanline) * w]));
		jpeg_write_scanlines(&cinfo, &row, 1);
	}
	jpeg_finish_compress(&cinfo);
	jpeg_destroy_compress(&cinfo);
	return fclose(file) == 0;
}

bool write_png_with_short_data(const std::string &path, int w, int h)
{
	if (!write_picture(path, w, h))
		return false;
	const Bytes png = read_bytes(path);
	Bytes out(png.begin(), png.begin() + 8), data;
	for (size_t pos = 8; pos + 12 <= png.size();) {
		const uint32_t length = be32(&png[pos]);
		const std::string type(reinterpret_cast<const char *>(&png[pos + 4]), 4);
		if (type == "IDAT")
			data.insert(data.end(), &png[pos + 8], &png[pos + 8] + length);
		else if (type != "IEND")
			out.insert(out.end(), &png[pos], &png[pos] + 12 + length);
		pos += 12 + length;
	}
	put_png_chunk(out, "IDAT", data.data(), data.size() / 2);
	put_png_chunk(out, "IEND", nullptr, 0);
	return write_bytes(path, out);
}

Pixels image_pixels(Evas_Object *image)
{
	Pixels p;
	evas_object_image_size_get(image, &p.w, &p.h);
	auto *data = static_cast<const uint32_t *>(evas_object_image_data_get(image, EINA_FALSE));
	if (data)
		p.data.assign(data, data + size_t(p.w) * p.h);
	return p;
}

Pixels stored_pixels(const std::string &path)
{
	Pixels p;
	Ecore_Evas *ee = ecore_evas_buffer_new(1, 1);
	if (!ee)
		return p;
	Evas_Object *image = evas_object_image_add(ecore_evas_get(ee));
	evas_object_image_load_orientation_set(image, EINA_FALSE);
	evas_object_image_file_set(image, path.c_str(), nullptr);
	p = image_pixels(image);
	evas_object_del(image);
	ecore_evas_free(ee);
	return p;
}

Pixels turned_upright(const Pixels &stored, int orientation)
{
	const int w = stored.w, h = stored.h;
	const bool turned = orientation >= 5;
	Pixels out;
	out.w = turned ? h : w;
	out.h = turned ? w : h;
	out.data.resize(stored.data.size());
	for (int y = 0; y < h; y++)
		for (int x = 0; x < w; x++) {
			std::array<int, 2> to;
			switch (orientation) {
			case 2: to = { w - 1 - x, y }; break;
			case 3: to = { w - 1 - x, h - 1 - y }; break;
			case 4: to = { x, h - 1 - y }; break;
			case 5: to = { y, x }; break;
			case 6: to = { h - 1 - y, x }; break;
			case 7: to = { h - 1 - y, w - 1 - x }; break;
			case 8: to = { y, w - 1 - x }; break;
			default: to = { x, y }; break;
			}
			out.data[size_t(to[1]) * out.w + to[0]] = stored.data[size_t(y) * w + x];
		}
	return out;
}

int grid_difference(const Pixels &a, const Pixels &b, int cells)
{
	auto cell_mean = [cells](const Pixels &p, int cx, int cy, int shift) {
		const int x0 = cx * p.w / cells, x1 = std::max(x0 + 1, (cx + 1) * p.w / cells);
		const int y0 = cy * p.h / cells, y1 = std::max(y0 + 1, (cy + 1) * p.h / cells);
		long sum = 0;
		for (int y = y0; y < y1; y++)
			for (int x = x0; x < x1; x++)
				sum += p.data[size_t(y) * p.w + x] >> shift & 0xFF;
		return double(sum) / ((x1 - x0) * (y1 - y0));
	};
	if (a.data.empty() || b.data.empty())
		return 256;
	double worst = 0;
	for (int cy = 0; cy < cells; cy++)
		for (int cx = 0; cx < cells; cx++)
			for (int shift : { 0, 8, 16 })
				worst = std::max(worst, std::abs(cell_mean(a, cx, cy, shift) - cell_mean(b, cx, cy, shift)));
	return int(worst + 0.5);
}

} // namespace iet
