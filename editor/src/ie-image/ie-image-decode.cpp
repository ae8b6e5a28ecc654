/* JPEG and PNG decoding into the area reducer; see ie-image-decode.h. Our
 * own decoders go first where they apply, libjpeg-turbo and libpng take
 * what they hand back. Both libraries report errors by longjmp: every
 * resource a decode holds lives in a record that outlives the jump, and
 * nothing with a destructor sits in a frame the jump leaves. */
#include "ie-image-decode.h"

#include <csetjmp>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>

#include <jpeglib.h>
#include <jerror.h>
#include <png.h>

#include "ie-engine.h"
#include "ie-image-png.h"
#include "ie-image-progressive.h"

namespace {

constexpr uint8_t JPEG_START[] = { 0xFF, 0xD8, 0xFF };
constexpr uint8_t PNG_SIGNATURE[] = { 0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n' };

/* Rows handed to the reducer at a time. */
constexpr int STRIP_ROWS = 16;
/* The DCT scalings with SIMD inverse transforms, smallest first. */
constexpr int JPEG_SCALES[] = { 1, 2, 4, 8 };
constexpr int JPEG_SCALE_DENOM = 8;

template <size_t N> bool starts_with(const uint8_t *data, size_t size, const uint8_t (&prefix)[N])
{
	return size >= N && memcmp(data, prefix, N) == 0;
}

/* What one decode holds, released by finish() whichever way it ends. */
struct Decode_Work {
	IEL_Reducer *reducer = nullptr;
	uint8_t *strip = nullptr;
	uint8_t *pixels = nullptr;
	uint32_t width = 0; /* of the rows going into the reducer */

	/* The output buffer, the reducer into it and a strip of rows. */
	bool start(uint32_t src_w, uint32_t src_h, int target_w, int target_h)
	{
		width = src_w;
		pixels = static_cast<uint8_t *>(malloc(size_t(target_w) * size_t(target_h) * 4));
		strip = static_cast<uint8_t *>(malloc(size_t(src_w) * 4 * STRIP_ROWS));
		IEL_Image out = { uint32_t(target_w), uint32_t(target_h), IEL_FORMAT_BGRA8888, pixels };
		return pixels && strip && IEL_Reducer_Create(src_w, src_h, &out, &reducer) == IEL_OK;
	}
	uint8_t *strip_row(int i) const { return strip + size_t(width) * 4 * size_t(i); }
	void push(int rows) const { IEL_Reducer_Push(reducer, strip, uint32_t(rows)); }
	static void push_rows(void *data, const uint8_t *rows, int count)
	{
		IEL_Reducer_Push(static_cast<Decode_Work *>(data)->reducer, rows, uint32_t(count));
	}
	void finish()
	{
		IEL_Reducer_Destroy(reducer);
		free(strip);
		free(pixels);
		*this = Decode_Work();
	}
};

/* ---- JPEG ---- */

struct Jpeg_Error {
	jpeg_error_mgr mgr;
	jmp_buf jump;
};

void jpeg_error_exit(j_common_ptr cinfo)
{
	longjmp(reinterpret_cast<Jpeg_Error *>(cinfo->err)->jump, 1);
}

/* Warnings (a stray byte before a marker, say) are passed over, as the
 * decoder itself passes over them; but data that runs out before the last
 * row is a damaged file, which the decoder would fill with grey. */
void jpeg_emit_message(j_common_ptr cinfo, int msg_level)
{
	const int code = cinfo->err->msg_code;
	if (msg_level < 0 && (code == JWRN_HIT_MARKER || code == JWRN_JPEG_EOF))
		jpeg_error_exit(cinfo);
}
void jpeg_output_message(j_common_ptr) {}

struct Jpeg_Decode {
	jpeg_decompress_struct cinfo;
	Jpeg_Error error;
	Decode_Work work;
};

void jpeg_prepare(Jpeg_Decode *d, const uint8_t *data, size_t size)
{
	d->cinfo.err = jpeg_std_error(&d->error.mgr);
	d->error.mgr.error_exit = jpeg_error_exit;
	d->error.mgr.emit_message = jpeg_emit_message;
	d->error.mgr.output_message = jpeg_output_message;
	jpeg_create_decompress(&d->cinfo);
	jpeg_mem_src(&d->cinfo, data, (unsigned long)size);
}

bool jpeg_ours(const jpeg_decompress_struct &cinfo)
{
	const bool colours = cinfo.jpeg_color_space == JCS_GRAYSCALE || cinfo.jpeg_color_space == JCS_YCbCr ||
			     cinfo.jpeg_color_space == JCS_RGB;
	return colours && cinfo.data_precision == 8 && ie_decode_size_ok(cinfo.image_width, cinfo.image_height);
}

bool jpeg_probe(const uint8_t *data, size_t size, int *w, int *h)
{
	Jpeg_Decode d;
	jpeg_prepare(&d, data, size);
	/* Set after the jump point: kept in memory across the jump. */
	volatile bool ours = false;
	if (!setjmp(d.error.jump)) {
		jpeg_read_header(&d.cinfo, TRUE);
		ours = jpeg_ours(d.cinfo);
		*w = int(d.cinfo.image_width);
		*h = int(d.cinfo.image_height);
	}
	jpeg_destroy_decompress(&d.cinfo);
	return ours;
}

/* Whether our progressive decoding gives the target without upsampling
 * chroma: at the scale it will choose (the smallest of 1/8, 2/8, 4/8 and
 * 8/8 that covers the target), every component's blocks give at most 8
 * samples a side. Asked before reading the scans, so that a file it would
 * hand back is not entropy-decoded twice. */
bool progressive_reachable(const jpeg_decompress_struct &cinfo, int target_w, int target_h)
{
	int scale = JPEG_SCALE_DENOM;
	for (int s : JPEG_SCALES)
		if ((long(cinfo.image_width) * s + 7) / 8 >= target_w && (long(cinfo.image_height) * s + 7) / 8 >= target_h) {
			scale = s;
			break;
		}
	for (int c = 0; c < cinfo.num_components; c++) {
		const jpeg_component_info &comp = cinfo.comp_info[c];
		if (comp.h_samp_factor <= 0 || comp.v_samp_factor <= 0 ||
		    scale * cinfo.max_h_samp_factor / comp.h_samp_factor > 8 ||
		    scale * cinfo.max_v_samp_factor / comp.v_samp_factor > 8)
			return false;
	}
	return true;
}

/* A progressive JPEG through our own decoder, at the smallest scale that
 * covers the target; NOT_OURS hands it back to libjpeg. */
enum class Progressive_Result { DONE, FAILED, CANCELLED, NOT_OURS };

Progressive_Result progressive_decode(Decode_Work *work, const uint8_t *data, size_t size, int target_w,
				      int target_h, Ie_Decode_Stop stop, void *stop_data)
{
	Ie_Progressive picture;
	Progressive_Result result = Progressive_Result::NOT_OURS;
	int w = 0, h = 0;
	switch (ie_progressive_read(data, size, target_w, target_h, stop, stop_data, &picture)) {
	case Ie_Progressive_Status::CANCELLED:
		result = Progressive_Result::CANCELLED;
		break;
	case Ie_Progressive_Status::NOT_OURS:
		break;
	case Ie_Progressive_Status::DONE:
		/* Full size with subsampled chroma needs upsampling: libjpeg's. */
		if (!ie_progressive_scale_ok(picture, &w, &h) || w < target_w || h < target_h)
			break;
		if (!work->start(uint32_t(w), uint32_t(h), target_w, target_h)) {
			result = Progressive_Result::FAILED;
			break;
		}
		switch (ie_progressive_render(picture, Decode_Work::push_rows, work, stop, stop_data)) {
		case Ie_Decode_Status::DONE:
			result = Progressive_Result::DONE;
			break;
		case Ie_Decode_Status::CANCELLED:
			result = Progressive_Result::CANCELLED;
			break;
		case Ie_Decode_Status::FAILED:
			result = Progressive_Result::FAILED;
			break;
		}
		break;
	}
	ie_progressive_free(&picture);
	return result;
}

Ie_Decode_Status jpeg_decode(Jpeg_Decode *d, const uint8_t *data, size_t size, int target_w, int target_h,
			     Ie_Decode_Stop stop, void *stop_data, Ie_Decoded *out)
{
	jpeg_prepare(d, data, size);
	Ie_Decode_Status status = Ie_Decode_Status::FAILED;
	if (setjmp(d->error.jump))
		goto done;
	jpeg_read_header(&d->cinfo, TRUE);
	if (!jpeg_ours(d->cinfo))
		goto done;
	if (d->cinfo.progressive_mode &&
	    (d->cinfo.jpeg_color_space == JCS_YCbCr || d->cinfo.jpeg_color_space == JCS_GRAYSCALE) &&
	    progressive_reachable(d->cinfo, target_w, target_h)) {
		switch (progressive_decode(&d->work, data, size, target_w, target_h, stop, stop_data)) {
		case Progressive_Result::DONE:
			*out = { d->work.pixels, target_w, target_h, false };
			d->work.pixels = nullptr;
			status = Ie_Decode_Status::DONE;
			goto done;
		case Progressive_Result::CANCELLED:
			status = Ie_Decode_Status::CANCELLED;
			goto done;
		case Progressive_Result::FAILED:
			goto done;
		case Progressive_Result::NOT_OURS:
			d->work.finish();
			break;
		}
	}
	d->cinfo.out_color_space = JCS_EXT_BGRA;
	d->cinfo.dct_method = JDCT_ISLOW;
	d->cinfo.scale_denom = JPEG_SCALE_DENOM;
	for (int scale : JPEG_SCALES) {
		d->cinfo.scale_num = scale;
		jpeg_calc_output_dimensions(&d->cinfo);
		if (int(d->cinfo.output_width) >= target_w && int(d->cinfo.output_height) >= target_h)
			break;
	}
	jpeg_start_decompress(&d->cinfo);
	if (!d->work.start(d->cinfo.output_width, d->cinfo.output_height, target_w, target_h))
		goto done;
	while (d->cinfo.output_scanline < d->cinfo.output_height) {
		if (stop && stop(stop_data)) {
			status = Ie_Decode_Status::CANCELLED;
			goto done;
		}
		JSAMPROW rows[STRIP_ROWS];
		int count = 0;
		while (count < STRIP_ROWS && d->cinfo.output_scanline + count < d->cinfo.output_height) {
			rows[count] = d->work.strip_row(count);
			count++;
		}
		/* The decoder may give fewer rows than asked. */
		for (int got = 0; got < count;) {
			const int read = int(jpeg_read_scanlines(&d->cinfo, rows + got, JDIMENSION(count - got)));
			if (read <= 0)
				goto done;
			got += read;
		}
		d->work.push(count);
	}
	*out = { d->work.pixels, target_w, target_h, false };
	d->work.pixels = nullptr;
	status = Ie_Decode_Status::DONE;
done:
	d->work.finish();
	jpeg_destroy_decompress(&d->cinfo);
	return status;
}

/* ---- PNG ---- */

struct Png_Reader {
	const uint8_t *data;
	size_t size, pos;
};

void png_read_bytes(png_structp png, png_bytep to, png_size_t count)
{
	auto *reader = static_cast<Png_Reader *>(png_get_io_ptr(png));
	if (reader->size - reader->pos < count)
		png_error(png, "Read past the end of the data");
	memcpy(to, reader->data + reader->pos, count);
	reader->pos += count;
}

void png_error_exit(png_structp png, png_const_charp)
{
	png_longjmp(png, 1);
}

void png_warning_ignored(png_structp, png_const_charp) {}

struct Png_Decode {
	png_structp png = nullptr;
	png_infop info = nullptr;
	Png_Reader reader = {};
	Decode_Work work;
};

bool png_prepare(Png_Decode *d, const uint8_t *data, size_t size)
{
	d->png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, png_error_exit, png_warning_ignored);
	if (!d->png)
		return false;
	d->info = png_create_info_struct(d->png);
	d->reader = { data, size, 0 };
	png_set_read_fn(d->png, &d->reader, png_read_bytes);
	return d->info != nullptr;
}

void png_release(Png_Decode *d)
{
	png_destroy_read_struct(&d->png, d->info ? &d->info : nullptr, nullptr);
}

bool png_ours(png_structp png, png_infop info)
{
	return png_get_interlace_type(png, info) == PNG_INTERLACE_NONE &&
	       ie_decode_size_ok(png_get_image_width(png, info), png_get_image_height(png, info));
}

bool png_probe(const uint8_t *data, size_t size, int *w, int *h)
{
	Png_Decode d;
	/* Set after the jump point: kept in memory across the jump. */
	volatile bool ours = false;
	if (png_prepare(&d, data, size) && !setjmp(png_jmpbuf(d.png))) {
		png_read_info(d.png, d.info);
		const png_uint_32 width = png_get_image_width(d.png, d.info), height = png_get_image_height(d.png, d.info);
		ours = png_ours(d.png, d.info);
		*w = int(width);
		*h = int(height);
	}
	png_release(&d);
	return ours;
}

/* As the canvas keeps pixels with alpha: each colour scaled by
 * (alpha + 1) / 256. */
void premultiply(uint8_t *row, size_t pixels)
{
	for (size_t i = 0; i < pixels; i++) {
		uint8_t *p = row + i * 4;
		const unsigned a = p[3] + 1u;
		p[0] = uint8_t((p[0] * a) >> 8);
		p[1] = uint8_t((p[1] * a) >> 8);
		p[2] = uint8_t((p[2] * a) >> 8);
	}
}

Ie_Decode_Status png_decode(Png_Decode *d, const uint8_t *data, size_t size, int target_w, int target_h,
			    Ie_Decode_Stop stop, void *stop_data, Ie_Decoded *out)
{
	/* The common kinds through our own decoding; libpng for the rest, and
	 * for anything ours finds amiss. */
	int w = 0, h = 0;
	bool has_alpha = false;
	if (ie_png_probe(data, size, &w, &h, &has_alpha)) {
		if (!d->work.start(uint32_t(w), uint32_t(h), target_w, target_h)) {
			d->work.finish();
			return Ie_Decode_Status::FAILED;
		}
		switch (ie_png_decode(data, size, Decode_Work::push_rows, &d->work, stop, stop_data)) {
		case Ie_Png_Status::DONE:
			*out = { d->work.pixels, target_w, target_h, has_alpha };
			d->work.pixels = nullptr;
			d->work.finish();
			return Ie_Decode_Status::DONE;
		case Ie_Png_Status::CANCELLED:
			d->work.finish();
			return Ie_Decode_Status::CANCELLED;
		case Ie_Png_Status::NOT_OURS:
			d->work.finish();
			break;
		}
	}
	Ie_Decode_Status status = Ie_Decode_Status::FAILED;
	if (!png_prepare(d, data, size) || setjmp(png_jmpbuf(d->png)))
		goto done;
	{
		png_read_info(d->png, d->info);
		if (!png_ours(d->png, d->info))
			goto done;
		const png_uint_32 width = png_get_image_width(d->png, d->info);
		const png_uint_32 height = png_get_image_height(d->png, d->info);
		const int colour = png_get_color_type(d->png, d->info);
		const bool alpha = (colour & PNG_COLOR_MASK_ALPHA) || png_get_valid(d->png, d->info, PNG_INFO_tRNS);
		png_set_expand(d->png);
		png_set_strip_16(d->png);
		if (!(colour & PNG_COLOR_MASK_COLOR))
			png_set_gray_to_rgb(d->png);
		png_set_bgr(d->png);
		if (!alpha)
			png_set_filler(d->png, 0xFF, PNG_FILLER_AFTER);
		png_read_update_info(d->png, d->info);
		if (png_get_rowbytes(d->png, d->info) != size_t(width) * 4 ||
		    !d->work.start(width, height, target_w, target_h))
			goto done;
		for (png_uint_32 y = 0; y < height;) {
			if (stop && stop(stop_data)) {
				status = Ie_Decode_Status::CANCELLED;
				goto done;
			}
			int count = 0;
			for (; count < STRIP_ROWS && y < height; count++, y++) {
				png_read_row(d->png, d->work.strip_row(count), nullptr);
				if (alpha)
					premultiply(d->work.strip_row(count), width);
			}
			d->work.push(count);
		}
		*out = { d->work.pixels, target_w, target_h, alpha };
		d->work.pixels = nullptr;
		status = Ie_Decode_Status::DONE;
	}
done:
	d->work.finish();
	png_release(d);
	return status;
}

/* The records are on the heap: each holds a jump buffer and the libraries'
 * state, and must stay put across the jump. */
template <class Decode, class Run>
Ie_Decode_Status decode_on_heap(Run run)
{
	auto *d = new (std::nothrow) Decode();
	if (!d)
		return Ie_Decode_Status::FAILED;
	Ie_Decode_Status status = run(d);
	delete d;
	return status;
}

} // namespace

bool ie_image_decode_probe(const uint8_t *data, size_t size, int *w, int *h)
{
	if (starts_with(data, size, JPEG_START))
		return jpeg_probe(data, size, w, h);
	if (starts_with(data, size, PNG_SIGNATURE))
		return png_probe(data, size, w, h);
	return false;
}

Ie_Decode_Status ie_image_decode(const uint8_t *data, size_t size, int target_w, int target_h, Ie_Decode_Stop stop,
				 void *stop_data, Ie_Decoded *out)
{
	*out = { nullptr, 0, 0, false };
	if (target_w <= 0 || target_h <= 0)
		return Ie_Decode_Status::FAILED;
	if (starts_with(data, size, JPEG_START))
		return decode_on_heap<Jpeg_Decode>([&](Jpeg_Decode *d) {
			return jpeg_decode(d, data, size, target_w, target_h, stop, stop_data, out);
		});
	if (starts_with(data, size, PNG_SIGNATURE))
		return decode_on_heap<Png_Decode>([&](Png_Decode *d) {
			return png_decode(d, data, size, target_w, target_h, stop, stop_data, out);
		});
	return Ie_Decode_Status::FAILED;
}
