/* IEL_Run_Effect and the closed-engine wrappers. The dispatcher turns one
 * BGRA picture into another by effect code: sepia, posterise and blur are
 * the engine's own, the rest are calls into the effect libraries. A source
 * in format 4 (each pixel's bytes reversed) is turned into format 3 for the
 * work and both pictures are turned back afterwards. The wrappers hand the
 * closed engine 3-byte RGB copies and turn its result back into opaque BGRA.
 * The dispatcher reports only its own checks: a wrapper's failure leaves the
 * output as the caller filled it and still counts as done.
 * The editor runs these effects on one picture size again and again, so the
 * wrappers keep their RGB buffers and the sketch's scaled texture for the
 * next call: fresh pages cost more than the conversions, and scaling the
 * texture more than the sketch itself. What is kept depends only on the
 * texture file's bytes and the picture's size, so every result is the one a
 * call from scratch gives. One caller at a time uses what is kept; a second
 * one meanwhile works from scratch. */
#include <immintrin.h>
#include <stddef.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <memory>
#include <mutex>
#include <string>
#include <utility>

#include <ie-config.h>

#include "PhotoEditorEngine.h"
#include "ie-engine-private.h"
#include "photoeditoreffects.h"

/* The closed engine reads these records with the layout of the 32-bit
 * target: the same field order and natural alignment give it there, and the
 * same rules are checked here on any pointer size. */
static_assert(offsetof(IEL_Image, u32Width) == 0 && offsetof(IEL_Image, u32Height) == 4 &&
		      offsetof(IEL_Image, eFormat) == 8 && offsetof(IEL_Image, pbBuf) == (sizeof(void *) == 4 ? 12 : 16),
	      "IEL_Image layout");
static_assert(sizeof(IEL_Image) == (sizeof(void *) == 4 ? 16 : 24), "IEL_Image size");
static_assert(offsetof(IEL_EffectParam, u16EffectId) == 0 && offsetof(IEL_EffectParam, u16Reserved) == 2 &&
		      offsetof(IEL_EffectParam, ps32Option) == (sizeof(void *) == 4 ? 4 : 8) &&
		      offsetof(IEL_EffectParam, pstTexture) == offsetof(IEL_EffectParam, ps32Option) + sizeof(void *) &&
		      offsetof(IEL_EffectParam, au32Reserved) == offsetof(IEL_EffectParam, pstTexture) + sizeof(void *),
	      "IEL_EffectParam layout");
static_assert(sizeof(IEL_EffectParam) == (sizeof(void *) == 4 ? 24 : 40), "IEL_EffectParam size");

namespace {

constexpr unsigned int kLargestEffect = IE_EFFECT_YELLOW_GLOW;
constexpr int kPosterizeStrength = 2;
constexpr unsigned int kBlurLevel = 4;
constexpr int kGreyscaleLevel = 10;
constexpr int kFadedColourLevel = 50;
constexpr int kSharpenLevel = 4;
constexpr int kSoftGlowLevel = 100;
constexpr int32_t kCartoonOption = 2;
constexpr int32_t kSketchOption = 2;

constexpr uint32_t kTextureWidth = 384;
constexpr uint32_t kTextureHeight = 512;
constexpr size_t kTextureFileBytes = kTextureWidth * kTextureHeight * 3;
static_assert(kTextureFileBytes == 589824, "sketch texture file size");

struct FreeDeleter {
	void operator()(void *p) const { free(p); }
};
using Buffer = std::unique_ptr<uint8_t, FreeDeleter>;

Buffer zeroed(size_t bytes)
{
	return Buffer(static_cast<uint8_t *>(calloc(1, bytes ? bytes : 1)));
}

std::string &texture_path_override()
{
	static std::string path;
	return path;
}

void reverse_pixel_bytes(uint8_t *pixels, size_t count)
{
	for (size_t i = 0; i < count; i++) {
		uint8_t *p = pixels + i * 4;
		uint8_t t = p[0];
		p[0] = p[3];
		p[3] = t;
		t = p[1];
		p[1] = p[2];
		p[2] = t;
	}
}

void bgra_to_rgb(const uint8_t *bgra, uint8_t *rgb, size_t count)
{
	if (iel_cpu_has_avx2())
		iel_bgra_to_rgb_avx2(bgra, rgb, count);
	else
		iel_bgra_to_rgb_reference(bgra, rgb, count);
}

void rgb_to_opaque_bgra(const uint8_t *rgb, uint8_t *bgra, size_t count)
{
	if (iel_cpu_has_avx2())
		iel_rgb_to_opaque_bgra_avx2(rgb, bgra, count);
	else
		iel_rgb_to_opaque_bgra_reference(rgb, bgra, count);
}

/* Checks shared by the wrappers: the closed engine writes an output of the
 * input's size, so the output record must have it too. */
int check_wrapper_records(const IEL_Image *src, const IEL_Image *dst, size_t *pixels)
{
	if (!src || !dst || !src->pbBuf || !dst->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	if (src->u32Width != dst->u32Width || src->u32Height != dst->u32Height)
		return IEL_ERR_INVALID_PARAM;
	int ok = 0;
	*pixels = iel_byte_count(src->u32Width, src->u32Height, 1, &ok);
	if (!ok || !iel_byte_count(src->u32Width, src->u32Height, 4, &ok) || !ok)
		return IEL_ERR_INVALID_SIZE;
	return IEL_OK;
}

/* A buffer that is reused while it is large enough. Its bytes are not
 * cleared between uses: every user writes what it reads. */
struct Scratch {
	Buffer bytes;
	size_t size = 0;

	uint8_t *reserve(size_t wanted)
	{
		if (!bytes || size < wanted) {
			bytes = zeroed(wanted);
			size = bytes ? wanted : 0;
		}
		return bytes.get();
	}
};

/* The texture scaled to one picture size. */
struct ScaledTexture {
	uint32_t width = 0, height = 0;
	Buffer pixels;
};

/* What the wrappers keep between calls: their RGB buffers, and the sketch
 * texture file's bytes with the texture scaled to the last two picture
 * sizes (the editor alternates between its thumbnails and the picture). */
struct WrapperWork {
	Scratch input, output;
	Scratch file, incoming;
	bool file_read = false;
	ScaledTexture scaled[2];
};

/* The kept work for one caller at a time: a caller that finds it taken gets
 * empty work of its own, used for this call only. */
class WorkLease {
public:
	WorkLease() : lock_(kept_mutex(), std::try_to_lock)
	{
		work_ = lock_.owns_lock() ? &kept() : &own_;
	}
	WrapperWork &operator*() { return *work_; }
	WrapperWork *operator->() { return work_; }

private:
	static std::mutex &kept_mutex()
	{
		static std::mutex mutex;
		return mutex;
	}
	static WrapperWork &kept()
	{
		static WrapperWork work;
		return work;
	}

	std::unique_lock<std::mutex> lock_;
	WrapperWork own_;
	WrapperWork *work_;
};

/* The closed engine's call with RGB copies of the picture; its result goes
 * into `dst` as opaque BGRA. */
int apply_closed(WrapperWork &work, const IEL_Image *src, IEL_Image *dst, size_t pixels,
		 const IEL_EffectParam &param)
{
	uint8_t *input = work.input.reserve(pixels * 3);
	uint8_t *output = work.output.reserve(pixels * 3);
	if (!input || !output)
		return IEL_ERR_NO_MEMORY;
	bgra_to_rgb(src->pbBuf, input, pixels);
	IEL_Image in_record = {src->u32Width, src->u32Height, IEL_FORMAT_RGB888, input};
	IEL_Image out_record = {src->u32Width, src->u32Height, IEL_FORMAT_RGB888, output};
	const int result = IEL_Apply_Effect(&in_record, &out_record, &param);
	if (result != 0)
		return result;
	rgb_to_opaque_bgra(output, dst->pbBuf, pixels);
	return IEL_OK;
}

int run_closed_effect(const IEL_Image *src, IEL_Image *dst, uint16_t effect_id, const int32_t *option)
{
	size_t pixels = 0;
	const int checked = check_wrapper_records(src, dst, &pixels);
	if (checked != IEL_OK)
		return checked;
	IEL_EffectParam param = {};
	param.u16EffectId = effect_id;
	param.ps32Option = const_cast<int32_t *>(option);
	WorkLease work;
	return apply_closed(*work, src, dst, pixels, param);
}

/* Reads the texture file into `work.file`. A file whose bytes differ from
 * those kept makes the scaled copies stale. */
int read_texture_file(WrapperWork &work)
{
	uint8_t *incoming = work.incoming.reserve(kTextureFileBytes);
	if (!incoming || !work.file.reserve(kTextureFileBytes))
		return IEL_ERR_NO_MEMORY;
	const std::string &override_path = texture_path_override();
	const std::string path = override_path.empty() ? std::string(RES_DIR "images/sketch.raw") : override_path;
	FILE *file = fopen(path.c_str(), "rb");
	if (!file)
		return IEL_ERR_FILE;
	const size_t items = fread(incoming, kTextureFileBytes, 1, file);
	fclose(file);
	if (items != 1)
		return IEL_ERR_FILE;
	if (work.file_read && memcmp(incoming, work.file.bytes.get(), kTextureFileBytes) == 0)
		return IEL_OK;
	std::swap(work.file, work.incoming);
	work.file_read = true;
	for (ScaledTexture &scaled : work.scaled)
		scaled = ScaledTexture();
	return IEL_OK;
}

/* The texture at the picture's size: the file's 384 x 512 pixels as opaque
 * BGRA, scaled bilinearly (the aspect ratio follows the picture). Kept as
 * the most recent of the two copies. */
int scaled_texture(WrapperWork &work, uint32_t width, uint32_t height, size_t pixels, const uint8_t **texture)
{
	ScaledTexture *slots = work.scaled;
	if (slots[1].pixels && slots[1].width == width && slots[1].height == height)
		std::swap(slots[0], slots[1]);
	if (!slots[0].pixels || slots[0].width != width || slots[0].height != height) {
		ScaledTexture fresh;
		fresh.pixels = zeroed(pixels * 4);
		Buffer whole = zeroed(static_cast<size_t>(kTextureWidth) * kTextureHeight * 4);
		if (!fresh.pixels || !whole)
			return IEL_ERR_NO_MEMORY;
		const uint8_t *file = work.file.bytes.get();
		uint8_t *expanded = whole.get();
		for (size_t i = 0; i < static_cast<size_t>(kTextureWidth) * kTextureHeight; i++) {
			expanded[i * 4] = file[i * 3];
			expanded[i * 4 + 1] = file[i * 3 + 1];
			expanded[i * 4 + 2] = file[i * 3 + 2];
			expanded[i * 4 + 3] = 255;
		}
		const IEL_Image whole_record = {kTextureWidth, kTextureHeight, IEL_FORMAT_BGRA8888, expanded};
		IEL_Image target = {width, height, IEL_FORMAT_BGRA8888, fresh.pixels.get()};
		if (IEL_Resize_Image(&whole_record, &target) != IEL_OK)
			return IEL_ERR_FILE;
		fresh.width = width;
		fresh.height = height;
		slots[1] = std::move(slots[0]);
		slots[0] = std::move(fresh);
	}
	*texture = slots[0].pixels.get();
	return IEL_OK;
}

}

void iel_bgra_to_rgb_reference(const uint8_t *bgra, uint8_t *rgb, size_t count)
{
	for (size_t i = 0; i < count; i++) {
		rgb[i * 3] = bgra[i * 4 + 2];
		rgb[i * 3 + 1] = bgra[i * 4 + 1];
		rgb[i * 3 + 2] = bgra[i * 4];
	}
}

void iel_rgb_to_opaque_bgra_reference(const uint8_t *rgb, uint8_t *bgra, size_t count)
{
	for (size_t i = 0; i < count; i++) {
		bgra[i * 4] = rgb[i * 3 + 2];
		bgra[i * 4 + 1] = rgb[i * 3 + 1];
		bgra[i * 4 + 2] = rgb[i * 3];
		bgra[i * 4 + 3] = 255;
	}
}

/* Eight pixels a step: each 16-byte half of the vector holds four pixels,
 * shuffled into 12 bytes and the halves joined. */
__attribute__((target("avx2"))) void iel_bgra_to_rgb_avx2(const uint8_t *bgra, uint8_t *rgb, size_t count)
{
	const __m256i order = _mm256_setr_epi8(2, 1, 0, 6, 5, 4, 10, 9, 8, 14, 13, 12, -1, -1, -1, -1, 2, 1, 0, 6, 5, 4,
					       10, 9, 8, 14, 13, 12, -1, -1, -1, -1);
	const __m256i joined = _mm256_setr_epi32(0, 1, 2, 4, 5, 6, 3, 7);
	size_t i = 0;
	for (; i + 8 <= count; i += 8) {
		const __m256i pixels = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(bgra + i * 4));
		const __m256i packed = _mm256_permutevar8x32_epi32(_mm256_shuffle_epi8(pixels, order), joined);
		_mm_storeu_si128(reinterpret_cast<__m128i *>(rgb + i * 3), _mm256_castsi256_si128(packed));
		_mm_storel_epi64(reinterpret_cast<__m128i *>(rgb + i * 3 + 16), _mm256_extracti128_si256(packed, 1));
	}
	iel_bgra_to_rgb_reference(bgra + i * 4, rgb + i * 3, count - i);
}

/* Eight pixels a step from two overlapping 16-byte loads of four pixels
 * each; the loop stops where the second load would read past the end. */
__attribute__((target("avx2"))) void iel_rgb_to_opaque_bgra_avx2(const uint8_t *rgb, uint8_t *bgra, size_t count)
{
	const __m256i order = _mm256_setr_epi8(2, 1, 0, -1, 5, 4, 3, -1, 8, 7, 6, -1, 11, 10, 9, -1, 2, 1, 0, -1, 5, 4, 3,
					       -1, 8, 7, 6, -1, 11, 10, 9, -1);
	const __m256i opaque = _mm256_set1_epi32(static_cast<int>(0xff000000u));
	size_t i = 0;
	for (; i + 10 <= count; i += 8) {
		const __m256i pixels =
			_mm256_loadu2_m128i(reinterpret_cast<const __m128i *>(rgb + i * 3 + 12), reinterpret_cast<const __m128i *>(rgb + i * 3));
		_mm256_storeu_si256(reinterpret_cast<__m256i *>(bgra + i * 4),
				    _mm256_or_si256(_mm256_shuffle_epi8(pixels, order), opaque));
	}
	iel_rgb_to_opaque_bgra_reference(rgb + i * 3, bgra + i * 4, count - i);
}

void iel_sketch_texture_path_set(const char *path)
{
	texture_path_override() = path ? path : "";
}

int IEL_Magic_Pen(const IEL_Image *src, IEL_Image *dst)
{
	return run_closed_effect(src, dst, IEL_EFFECT_ID_MAGIC_PEN, nullptr);
}

int IEL_Oil_Paint(const IEL_Image *src, IEL_Image *dst)
{
	return run_closed_effect(src, dst, IEL_EFFECT_ID_OIL_PAINT, nullptr);
}

int IEL_Cartoon(const IEL_Image *src, IEL_Image *dst)
{
	static const int32_t option = kCartoonOption;
	return run_closed_effect(src, dst, IEL_EFFECT_ID_CARTOON, &option);
}

int IEL_Sketch(const IEL_Image *src, IEL_Image *dst)
{
	size_t pixels = 0;
	const int checked = check_wrapper_records(src, dst, &pixels);
	if (checked != IEL_OK)
		return checked;
	WorkLease work;
	const int read = read_texture_file(*work);
	if (read != IEL_OK)
		return read;
	const uint8_t *texture_pixels = nullptr;
	const int scaled = scaled_texture(*work, src->u32Width, src->u32Height, pixels, &texture_pixels);
	if (scaled != IEL_OK)
		return scaled;
	static const int32_t option = kSketchOption;
	IEL_Image texture = {src->u32Width, src->u32Height, IEL_FORMAT_BGRA8888, const_cast<uint8_t *>(texture_pixels)};
	IEL_EffectParam param = {};
	param.u16EffectId = IEL_EFFECT_ID_SKETCH;
	param.ps32Option = const_cast<int32_t *>(&option);
	param.pstTexture = &texture;
	return apply_closed(*work, src, dst, pixels, param);
}

namespace {

void run_known_effect(IEL_Image *src, IEL_Image *dst, unsigned int effect)
{
	const uint8_t *in = src->pbBuf;
	uint8_t *out = dst->pbBuf;
	const int width = static_cast<int>(src->u32Width);
	const int height = static_cast<int>(src->u32Height);
	switch (effect) {
	case IE_EFFECT_VINTAGE: applyVintage(in, out, width, height); break;
	case IE_EFFECT_OLD_PHOTO: applyOldPhoto(in, out, width, height); break;
	case IE_EFFECT_POP_ART: applyPopArt(in, out, width, height); break;
	case IE_EFFECT_GREYSCALE: controlGreyscale(in, out, width, height, kGreyscaleLevel); break;
	case IE_EFFECT_SEPIA:
		iel_sepia_fast(in, out, static_cast<size_t>(src->u32Width) * src->u32Height,
			       iel_bytes_per_pixel(src->eFormat));
		break;
	case IE_EFFECT_FADED_COLOURS: controlFadedColour(in, out, width, height, kFadedColourLevel); break;
	case IE_EFFECT_NEGATIVE: applyInvert(in, out, width, height); break;
	case IE_EFFECT_CARTOON: IEL_Cartoon(src, dst); break;
	case IE_EFFECT_SHARPEN: mi_apply_sharpen_all(in, out, width, height, kSharpenLevel); break;
	case IE_EFFECT_SOFT_GLOW: applySoftglow(in, out, width, height, kSoftGlowLevel); break;
	case IE_EFFECT_MAGIC_PEN: IEL_Magic_Pen(src, dst); break;
	case IE_EFFECT_OIL_PAINT: IEL_Oil_Paint(src, dst); break;
	case IE_EFFECT_POSTERISE: IEL_Posterize(src, dst, kPosterizeStrength); break;
	case IE_EFFECT_SKETCH: IEL_Sketch(src, dst); break;
	case IE_EFFECT_BLUR: {
		IEL_RowSumBufInfo info = {nullptr, 0};
		IEL_Variable_Blur_BGRA888_skip(src, dst, &info, kBlurLevel, 1, 1);
		free(info.ps32Buf);
		break;
	}
	case IE_EFFECT_RETRO: applyRetro(in, out, width, height); break;
	case IE_EFFECT_BLUEWASH: applyBluewash(in, out, width, height); break;
	case IE_EFFECT_SUNSHINE: applySunshine(in, out, width, height); break;
	case IE_EFFECT_NOSTALGIA: applyNostalgia(in, out, width, height); break;
	case IE_EFFECT_DOWNLIGHT: applyDownlight(in, out, width, height); break;
	case IE_EFFECT_YELLOW_GLOW: applyYellowglow(in, out, width, height); break;
	default: break;
	}
}

}

int IEL_Run_Effect(IEL_Image *src, IEL_Image *dst, unsigned int effect)
{
	if (!src || !dst || !src->pbBuf || !dst->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	if (src->u32Width == 0 || src->u32Height == 0)
		return IEL_ERR_INVALID_SIZE;
	if (!iel_format_known(src->eFormat))
		return IEL_ERR_UNSUPPORTED_FORMAT;
	/* The effect libraries take int sizes. */
	int ok = 0;
	iel_byte_count(src->u32Width, src->u32Height, 4, &ok);
	if (!ok || src->u32Width > INT32_MAX || src->u32Height > INT32_MAX)
		return IEL_ERR_INVALID_SIZE;

	const size_t pixels = static_cast<size_t>(src->u32Width) * src->u32Height;
	const bool converted = src->eFormat == IEL_FORMAT_ARGB8888;
	if (converted) {
		reverse_pixel_bytes(src->pbBuf, pixels);
		src->eFormat = IEL_FORMAT_BGRA8888;
	}

	/* An unknown code changes nothing of the caller's output: only an
	 * effect that ran is turned back into format 4. */
	const bool known = effect <= kLargestEffect;
	if (known) {
		run_known_effect(src, dst, effect);
		dst->u32Width = src->u32Width;
		dst->u32Height = src->u32Height;
		dst->eFormat = IEL_FORMAT_BGRA8888;
	}

	if (converted) {
		reverse_pixel_bytes(src->pbBuf, pixels);
		src->eFormat = IEL_FORMAT_ARGB8888;
		if (known) {
			reverse_pixel_bytes(dst->pbBuf, pixels);
			dst->eFormat = IEL_FORMAT_ARGB8888;
		}
	}
	return known ? IEL_OK : IEL_ERR_INVALID_PARAM;
}
