/* IEL_Run_Effect and the closed-engine wrappers. The dispatcher turns one
 * BGRA picture into another by effect code: sepia, posterise and blur are
 * the engine's own, the rest are calls into the effect libraries. A source
 * in format 4 (each pixel's bytes reversed) is turned into format 3 for the
 * work and both pictures are turned back afterwards. The wrappers hand the
 * closed engine 3-byte RGB copies and turn its result back into opaque BGRA.
 * The dispatcher reports only its own checks: a wrapper's failure leaves the
 * output as the caller filled it and still counts as done. */
#include <stddef.h>
#include <stdio.h>
#include <stdlib.h>

#include <memory>
#include <string>

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
	for (size_t i = 0; i < count; i++) {
		rgb[i * 3] = bgra[i * 4 + 2];
		rgb[i * 3 + 1] = bgra[i * 4 + 1];
		rgb[i * 3 + 2] = bgra[i * 4];
	}
}

void rgb_to_opaque_bgra(const uint8_t *rgb, uint8_t *bgra, size_t count)
{
	for (size_t i = 0; i < count; i++) {
		bgra[i * 4] = rgb[i * 3 + 2];
		bgra[i * 4 + 1] = rgb[i * 3 + 1];
		bgra[i * 4 + 2] = rgb[i * 3];
		bgra[i * 4 + 3] = 255;
	}
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

int run_closed_effect(const IEL_Image *src, IEL_Image *dst, uint16_t effect_id, const int32_t *option)
{
	size_t pixels = 0;
	const int checked = check_wrapper_records(src, dst, &pixels);
	if (checked != IEL_OK)
		return checked;
	Buffer input = zeroed(pixels * 3);
	Buffer output = zeroed(pixels * 3);
	if (!input || !output)
		return IEL_ERR_NO_MEMORY;
	bgra_to_rgb(src->pbBuf, input.get(), pixels);
	IEL_Image in_record = {src->u32Width, src->u32Height, IEL_FORMAT_RGB888, input.get()};
	IEL_Image out_record = {src->u32Width, src->u32Height, IEL_FORMAT_RGB888, output.get()};
	IEL_EffectParam param = {};
	param.u16EffectId = effect_id;
	param.ps32Option = const_cast<int32_t *>(option);
	const int result = IEL_Apply_Effect(&in_record, &out_record, &param);
	if (result != 0)
		return result;
	rgb_to_opaque_bgra(output.get(), dst->pbBuf, pixels);
	return IEL_OK;
}

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
	Buffer input = zeroed(pixels * 3);
	Buffer output = zeroed(pixels * 3);
	Buffer file_pixels = zeroed(kTextureFileBytes);
	if (!input || !output || !file_pixels)
		return IEL_ERR_NO_MEMORY;

	const std::string &override_path = texture_path_override();
	const std::string path = override_path.empty() ? std::string(RES_DIR "images/sketch.raw") : override_path;
	FILE *file = fopen(path.c_str(), "rb");
	if (!file)
		return IEL_ERR_FILE;
	const size_t items = fread(file_pixels.get(), kTextureFileBytes, 1, file);
	fclose(file);
	if (items != 1)
		return IEL_ERR_FILE;

	bgra_to_rgb(src->pbBuf, input.get(), pixels);
	Buffer texture_pixels = zeroed(pixels * 4);
	Buffer sketch = zeroed(static_cast<size_t>(kTextureWidth) * kTextureHeight * 4);
	if (!texture_pixels || !sketch)
		return IEL_ERR_NO_MEMORY;
	for (size_t i = 0; i < static_cast<size_t>(kTextureWidth) * kTextureHeight; i++) {
		sketch.get()[i * 4] = file_pixels.get()[i * 3];
		sketch.get()[i * 4 + 1] = file_pixels.get()[i * 3 + 1];
		sketch.get()[i * 4 + 2] = file_pixels.get()[i * 3 + 2];
		sketch.get()[i * 4 + 3] = 255;
	}
	const IEL_Image sketch_record = {kTextureWidth, kTextureHeight, IEL_FORMAT_BGRA8888, sketch.get()};
	IEL_Image texture = {src->u32Width, src->u32Height, IEL_FORMAT_BGRA8888, texture_pixels.get()};
	if (IEL_Resize_Image(&sketch_record, &texture) != IEL_OK)
		return IEL_ERR_FILE;

	static const int32_t option = kSketchOption;
	IEL_Image in_record = {src->u32Width, src->u32Height, IEL_FORMAT_RGB888, input.get()};
	IEL_Image out_record = {src->u32Width, src->u32Height, IEL_FORMAT_RGB888, output.get()};
	IEL_EffectParam param = {};
	param.u16EffectId = IEL_EFFECT_ID_SKETCH;
	param.ps32Option = const_cast<int32_t *>(&option);
	param.pstTexture = &texture;
	const int result = IEL_Apply_Effect(&in_record, &out_record, &param);
	if (result != 0)
		return result;
	rgb_to_opaque_bgra(output.get(), dst->pbBuf, pixels);
	return IEL_OK;
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
