/* JPEG files for the image tests, written with libjpeg itself for the
 * layouts Evas's saver never makes: every sampling, several scans with or
 * without successive approximation, restart markers, arithmetic coding. */
#ifndef TEST_JPEG_ENCODE_H
#define TEST_JPEG_ENCODE_H

#include <cstdio>

#include <jpeglib.h>

#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <random>
#include <vector>

using Bytes = std::vector<uint8_t>;

/* Smooth shapes under seeded noise: both long runs of zeros and dense
 * blocks. */
inline Bytes test_pixels(int w, int h, int components, uint32_t seed, int noise)
{
	Bytes pixels(size_t(w) * h * components);
	std::mt19937 rng(seed);
	std::uniform_int_distribution<int> jitter(-noise, noise);
	for (int y = 0; y < h; y++)
		for (int x = 0; x < w; x++)
			for (int c = 0; c < components; c++) {
				const double wave = 128 + 90 * std::sin((x + 3 * c) * 0.09) * std::cos((y - 5 * c) * 0.07);
				const int v = int(wave) + (noise ? jitter(rng) : 0);
				pixels[(size_t(y) * w + x) * components + c] = uint8_t(v < 0 ? 0 : v > 255 ? 255 : v);
			}
	return pixels;
}

struct Encoding {
	int components = 3;
	int h0 = 2, v0 = 2; /* the luma's sampling; chroma is 1 x 1 */
	int quality = 90;
	bool successive = true; /* libjpeg's script; else spectral selection only */
	int restart = 0;	/* in MCUs */
	bool progressive = true;
	bool arithmetic = false;
};

inline Bytes encode(const Bytes &pixels, int w, int h, const Encoding &e)
{
	jpeg_compress_struct cinfo;
	jpeg_error_mgr error;
	cinfo.err = jpeg_std_error(&error);
	jpeg_create_compress(&cinfo);
	unsigned char *out = nullptr;
	unsigned long size = 0;
	jpeg_mem_dest(&cinfo, &out, &size);
	cinfo.image_width = JDIMENSION(w);
	cinfo.image_height = JDIMENSION(h);
	cinfo.input_components = e.components;
	cinfo.in_color_space = e.components == 3 ? JCS_RGB : JCS_GRAYSCALE;
	jpeg_set_defaults(&cinfo);
	jpeg_set_quality(&cinfo, e.quality, TRUE);
	cinfo.comp_info[0].h_samp_factor = e.h0;
	cinfo.comp_info[0].v_samp_factor = e.v0;
	cinfo.restart_interval = JDIMENSION(e.restart);
	cinfo.arith_code = e.arithmetic;
	static jpeg_scan_info spectral[] = {
		{ 3, { 0, 1, 2 }, 0, 0, 0, 0 }, { 1, { 0 }, 1, 9, 0, 0 },  { 1, { 0 }, 10, 63, 0, 0 },
		{ 1, { 1 }, 1, 63, 0, 0 },	{ 1, { 2 }, 1, 63, 0, 0 },
	};
	static jpeg_scan_info spectral_grey[] = { { 1, { 0 }, 0, 0, 0, 0 }, { 1, { 0 }, 1, 5, 0, 0 },
						  { 1, { 0 }, 6, 63, 0, 0 } };
	if (e.progressive && e.successive) {
		jpeg_simple_progression(&cinfo);
	} else if (e.progressive) {
		cinfo.scan_info = e.components == 3 ? spectral : spectral_grey;
		cinfo.num_scans = e.components == 3 ? 5 : 3;
	}
	jpeg_start_compress(&cinfo, TRUE);
	while (cinfo.next_scanline < cinfo.image_height) {
		auto *row = const_cast<JSAMPLE *>(&pixels[size_t(cinfo.next_scanline) * w * e.components]);
		jpeg_write_scanlines(&cinfo, &row, 1);
	}
	jpeg_finish_compress(&cinfo);
	jpeg_destroy_compress(&cinfo);
	Bytes file(out, out + size);
	free(out);
	return file;
}

#endif
