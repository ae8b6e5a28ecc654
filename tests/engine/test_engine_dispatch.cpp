/* The effect dispatcher and the closed-engine wrappers, with the effect
 * libraries replaced by stand-ins defined here that record each call. */
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <mutex>
#include <thread>

#include "PhotoEditorEngine.h"
#include "engine-test-util.h"
#include "ie-engine-private.h"
#include "photoeditoreffects.h"

using namespace engine_test;

namespace {

struct Call { std::string name; int width, height, level; std::vector<uint8_t> input; };
struct ClosedCall {
	IEL_Image input, output, texture;
	IEL_EffectParam param;
	int32_t option;
	std::vector<uint8_t> input_pixels, texture_pixels;
};

std::vector<Call> calls;
std::vector<ClosedCall> closed_calls;
std::mutex closed_calls_mutex;
int closed_result;

/* Each stand-in writes out = in ^ 0x5a, so its result is recognisable. */
int record(const char *name, const unsigned char *in, unsigned char *out, int width, int height, int level = -1)
{
	const size_t bytes = static_cast<size_t>(width) * height * 4;
	calls.push_back({name, width, height, level, std::vector<uint8_t>(in, in + bytes)});
	for (size_t i = 0; i < bytes; i++)
		out[i] = in[i] ^ 0x5a;
	return 0;
}

}

#define STAND_IN(name) \
	int name(const unsigned char *in, unsigned char *out, int w, int h) { return record(#name, in, out, w, h); }
#define STAND_IN_LEVEL(name) \
	int name(const unsigned char *in, unsigned char *out, int w, int h, int l) { return record(#name, in, out, w, h, l); }

extern "C" {
STAND_IN(applyVintage) STAND_IN(applyOldPhoto) STAND_IN(applyPopArt) STAND_IN(applyInvert) STAND_IN(applyRetro)
STAND_IN(applyBluewash) STAND_IN(applySunshine) STAND_IN(applyNostalgia) STAND_IN(applyDownlight)
STAND_IN(applyYellowglow) STAND_IN_LEVEL(applySoftglow) STAND_IN_LEVEL(controlGreyscale)
STAND_IN_LEVEL(controlFadedColour) STAND_IN_LEVEL(mi_apply_sharpen_all)

/* The closed engine's stand-in: output RGB = input RGB + 1, or a failure. */
int IEL_Apply_Effect(const IEL_Image *input, IEL_Image *output, const IEL_EffectParam *param)
{
	const size_t pixels = static_cast<size_t>(input->u32Width) * input->u32Height;
	ClosedCall call = {*input, *output, {}, *param, param->ps32Option ? *param->ps32Option : -1, {}, {}};
	call.input_pixels.assign(input->pbBuf, input->pbBuf + pixels * 3);
	if (param->pstTexture) {
		call.texture = *param->pstTexture;
		call.texture_pixels.assign(call.texture.pbBuf, call.texture.pbBuf + pixels * 4);
	}
	{
		std::lock_guard<std::mutex> lock(closed_calls_mutex);
		closed_calls.push_back(call);
	}
	for (size_t i = 0; i < pixels * 3 && !closed_result; i++)
		output->pbBuf[i] = static_cast<uint8_t>(input->pbBuf[i] + 1);
	return closed_result;
}
}

namespace {

class Dispatch : public ::testing::Test {
protected:
	void SetUp() override { calls.clear(), closed_calls.clear(), closed_result = 0; }
	void TearDown() override { iel_sketch_texture_path_set(nullptr); }
};

std::vector<uint8_t> reversed_pixels(std::vector<uint8_t> bytes)
{
	for (size_t i = 0; i < bytes.size(); i += 4)
		std::reverse(bytes.begin() + i, bytes.begin() + i + 4);
	return bytes;
}

std::vector<uint8_t> xored(std::vector<uint8_t> bytes)
{
	for (uint8_t &b : bytes)
		b ^= 0x5a;
	return bytes;
}

/* A wrapper's result with the closed stand-in: RGB + 1, opaque. */
std::vector<uint8_t> closed_result_of(std::vector<uint8_t> bgra)
{
	for (size_t i = 0; i < bgra.size(); i++)
		bgra[i] = i % 4 == 3 ? 255 : static_cast<uint8_t>(bgra[i] + 1);
	return bgra;
}

}

TEST_F(Dispatch, LibraryCodesCallTheirFunctionAndOthersAreRefused)
{
	struct Case { unsigned int code; const char *name; int level; };
	const Case cases[] = {{IE_EFFECT_VINTAGE, "applyVintage", -1}, {IE_EFFECT_OLD_PHOTO, "applyOldPhoto", -1},
			      {IE_EFFECT_POP_ART, "applyPopArt", -1}, {IE_EFFECT_GREYSCALE, "controlGreyscale", 10},
			      {IE_EFFECT_FADED_COLOURS, "controlFadedColour", 50}, {IE_EFFECT_NEGATIVE, "applyInvert", -1},
			      {IE_EFFECT_SHARPEN, "mi_apply_sharpen_all", 4}, {IE_EFFECT_SOFT_GLOW, "applySoftglow", 100},
			      {IE_EFFECT_RETRO, "applyRetro", -1}, {IE_EFFECT_BLUEWASH, "applyBluewash", -1},
			      {IE_EFFECT_SUNSHINE, "applySunshine", -1}, {IE_EFFECT_NOSTALGIA, "applyNostalgia", -1},
			      {IE_EFFECT_DOWNLIGHT, "applyDownlight", -1}, {IE_EFFECT_YELLOW_GLOW, "applyYellowglow", -1}};
	Picture src = random_picture(5, 3, 3);
	for (const Case &c : cases) {
		calls.clear();
		Picture out = zeroed_picture(5, 3);
		out.record = {0, 0, 0, out.data()};
		ASSERT_EQ(IEL_Run_Effect(&src.record, &out.record, c.code), IEL_OK) << c.name;
		ASSERT_EQ(calls.size(), 1u) << c.name;
		EXPECT_TRUE(calls[0].name == c.name && calls[0].level == c.level && calls[0].width == 5 && calls[0].height == 3) << c.name;
		EXPECT_TRUE(out.pixels() == xored(src.pixels()) && out.guard_intact());
		EXPECT_TRUE(out.record.u32Width == 5 && out.record.u32Height == 3 && out.record.eFormat == IEL_FORMAT_BGRA8888);
	}
	calls.clear();
	Picture out = zeroed_picture(5, 3);
	out.record = {7, 3, 0, out.data()};
	for (unsigned int code : {21u, static_cast<unsigned int>(-1)})
		EXPECT_EQ(IEL_Run_Effect(&src.record, &out.record, code), IEL_ERR_INVALID_PARAM);
	EXPECT_TRUE(calls.empty() && out.record.u32Width == 7 && out.record.eFormat == 0);
	EXPECT_EQ(out.pixels(), std::vector<uint8_t>(out.size, 0));
}

/* A format-4 source is worked on in format 3 and comes back in its own byte
 * order; the output of an effect that ran is reversed into format 4. A
 * refused code leaves the caller's output, pixels and record, untouched. */
TEST_F(Dispatch, Format4RoundTrip)
{
	Picture src = random_picture(3, 2, 4), out = zeroed_picture(3, 2);
	src.record.eFormat = IEL_FORMAT_ARGB8888;
	const std::vector<uint8_t> original = src.pixels();
	ASSERT_EQ(IEL_Run_Effect(&src.record, &out.record, IE_EFFECT_NEGATIVE), IEL_OK);
	ASSERT_EQ(calls.size(), 1u);
	EXPECT_EQ(calls[0].input, reversed_pixels(original));
	EXPECT_TRUE(out.pixels() == xored(original) && out.record.eFormat == IEL_FORMAT_ARGB8888);
	EXPECT_TRUE(src.pixels() == original && src.record.eFormat == IEL_FORMAT_ARGB8888);

	for (unsigned int code : {21u, 100u, static_cast<unsigned int>(-1)}) {
		Picture refused(3, 2);
		const IEL_Image before = refused.record;
		EXPECT_EQ(IEL_Run_Effect(&src.record, &refused.record, code), IEL_ERR_INVALID_PARAM) << code;
		EXPECT_TRUE(refused.untouched()) << code;
		EXPECT_TRUE(refused.record.u32Width == before.u32Width && refused.record.u32Height == before.u32Height &&
			    refused.record.eFormat == before.eFormat && refused.record.pbBuf == before.pbBuf)
			<< code;
		EXPECT_TRUE(src.pixels() == original && src.record.eFormat == IEL_FORMAT_ARGB8888) << code;
	}
}

TEST_F(Dispatch, OwnRoutines)
{
	Picture src = random_picture(17, 11, 5), sepia(17, 11), direct_sepia(17, 11);
	Picture posterised(17, 11), direct_posterised(17, 11), blurred(17, 11), direct_blurred(17, 11);
	ASSERT_EQ(IEL_Run_Effect(&src.record, &sepia.record, IE_EFFECT_SEPIA), IEL_OK);
	iel_sepia_reference(src.data(), direct_sepia.data(), 17 * 11, 4);
	ASSERT_EQ(IEL_Run_Effect(&src.record, &posterised.record, IE_EFFECT_POSTERISE), IEL_OK);
	ASSERT_EQ(IEL_Posterize(&src.record, &direct_posterised.record, 2), IEL_OK);
	/* The dispatcher frees its row-sum buffer (the leak checker sees it). */
	ASSERT_EQ(IEL_Run_Effect(&src.record, &blurred.record, IE_EFFECT_BLUR), IEL_OK);
	IEL_RowSumBufInfo info = {nullptr, 0};
	ASSERT_EQ(IEL_Variable_Blur_BGRA888_skip(&src.record, &direct_blurred.record, &info, 4, 1, 1), IEL_OK);
	free(info.ps32Buf);
	EXPECT_TRUE(sepia.pixels() == direct_sepia.pixels() && posterised.pixels() == direct_posterised.pixels());
	EXPECT_TRUE(blurred.pixels() == direct_blurred.pixels() && calls.empty());
}

TEST_F(Dispatch, WrappersHandTheClosedEngineRgbAndReturnOpaqueBgra)
{
	struct Case { unsigned int code; int (*wrapper)(const IEL_Image *, IEL_Image *); uint16_t id; int32_t option; };
	Picture src = random_picture(6, 5, 6);
	std::vector<uint8_t> rgb;
	for (size_t i = 0; i < src.size; i += 4)
		rgb.insert(rgb.end(), {src.bytes[i + 2], src.bytes[i + 1], src.bytes[i]});
	for (const Case &c : {Case{IE_EFFECT_MAGIC_PEN, IEL_Magic_Pen, IEL_EFFECT_ID_MAGIC_PEN, -1},
			      Case{IE_EFFECT_OIL_PAINT, IEL_Oil_Paint, IEL_EFFECT_ID_OIL_PAINT, -1},
			      Case{IE_EFFECT_CARTOON, IEL_Cartoon, IEL_EFFECT_ID_CARTOON, 2}}) {
		closed_calls.clear();
		Picture out = zeroed_picture(6, 5), dispatched = zeroed_picture(6, 5);
		ASSERT_EQ(c.wrapper(&src.record, &out.record), IEL_OK);
		ASSERT_EQ(closed_calls.size(), 1u);
		const ClosedCall &call = closed_calls[0];
		/* The block is zero apart from the id and the option pointer. */
		IEL_EffectParam expected;
		std::memset(&expected, 0, sizeof expected);
		expected.u16EffectId = c.id;
		expected.ps32Option = call.param.ps32Option;
		EXPECT_TRUE(std::memcmp(&call.param, &expected, sizeof expected) == 0 && call.option == c.option) << c.id;
		EXPECT_TRUE(call.input.u32Width == 6 && call.input.u32Height == 5 && call.input.eFormat == IEL_FORMAT_RGB888);
		EXPECT_TRUE(call.output.eFormat == IEL_FORMAT_RGB888 && call.input_pixels == rgb);
		EXPECT_EQ(out.pixels(), closed_result_of(src.pixels()));
		ASSERT_EQ(IEL_Run_Effect(&src.record, &dispatched.record, c.code), IEL_OK);
		EXPECT_TRUE(dispatched.pixels() == out.pixels());
	}
}

TEST_F(Dispatch, WrapperFailures)
{
	Picture src = random_picture(4, 4, 7), out = zeroed_picture(4, 4), smaller = zeroed_picture(4, 3);
	closed_result = 42;
	EXPECT_EQ(IEL_Oil_Paint(&src.record, &out.record), 42);
	/* The dispatcher counts a failed wrapper as done: zero pixels, result 0. */
	EXPECT_EQ(IEL_Run_Effect(&src.record, &out.record, IE_EFFECT_CARTOON), IEL_OK);
	EXPECT_TRUE(out.pixels() == std::vector<uint8_t>(out.size, 0) && out.record.eFormat == IEL_FORMAT_BGRA8888);
	closed_calls.clear();
	EXPECT_EQ(IEL_Magic_Pen(nullptr, &out.record), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(IEL_Sketch(&src.record, nullptr), IEL_ERR_INVALID_PARAM);
	EXPECT_EQ(IEL_Cartoon(&src.record, &smaller.record), IEL_ERR_INVALID_PARAM);
	EXPECT_TRUE(closed_calls.empty());
}

/* The texture file's 384 x 512 RGB pixels as opaque BGRA, scaled to the
 * picture's size. */
std::vector<uint8_t> scaled_texture(const std::vector<uint8_t> &content, uint32_t width, uint32_t height)
{
	std::vector<uint8_t> expanded(384 * 512 * 4), scaled(size_t(width) * height * 4);
	for (size_t i = 0; i < 384 * 512; i++) {
		std::memcpy(&expanded[i * 4], &content[i * 3], 3);
		expanded[i * 4 + 3] = 255;
	}
	IEL_Image whole = {384, 512, IEL_FORMAT_BGRA8888, expanded.data()}, target = {width, height, IEL_FORMAT_BGRA8888, scaled.data()};
	EXPECT_EQ(IEL_Resize_Image(&whole, &target), IEL_OK);
	return scaled;
}

void write_file(const std::string &path, const std::vector<uint8_t> &content, size_t bytes)
{
	FILE *file = fopen(path.c_str(), "wb");
	ASSERT_TRUE(file);
	fwrite(content.data(), 1, bytes, file);
	fclose(file);
}

/* The texture is a file of 384 x 512 RGB pixels, read no further; a missing
 * or short file fails the wrapper, and the dispatcher then leaves zeros. */
TEST_F(Dispatch, SketchTexture)
{
	Picture src = random_picture(9, 7, 8), out = zeroed_picture(9, 7);
	const std::string path = "/tmp/sketch-texture-" + std::to_string(getpid());
	iel_sketch_texture_path_set(path.c_str());
	EXPECT_EQ(IEL_Sketch(&src.record, &out.record), IEL_ERR_FILE);
	EXPECT_EQ(IEL_Run_Effect(&src.record, &out.record, IE_EFFECT_SKETCH), IEL_OK);
	EXPECT_TRUE(closed_calls.empty() && out.pixels() == std::vector<uint8_t>(out.size, 0));
	std::vector<uint8_t> content = random_picture(589824 + 10, 1, 11, IEL_FORMAT_RGB888, 1).pixels();
	for (size_t bytes : {size_t(589823), content.size()}) {
		write_file(path, content, bytes);
		EXPECT_EQ(IEL_Sketch(&src.record, &out.record), bytes == 589823 ? IEL_ERR_FILE : IEL_OK);
		EXPECT_EQ(closed_calls.size(), bytes == 589823 ? 0u : 1u);
	}
	remove(path.c_str());
	ASSERT_EQ(closed_calls.size(), 1u);
	const ClosedCall &call = closed_calls[0];
	EXPECT_TRUE(call.param.u16EffectId == IEL_EFFECT_ID_SKETCH && call.option == 2);
	EXPECT_TRUE(call.texture.u32Width == 9 && call.texture.u32Height == 7 && call.texture.eFormat == IEL_FORMAT_BGRA8888);
	EXPECT_EQ(call.texture_pixels, scaled_texture(content, 9, 7));
	EXPECT_EQ(out.pixels(), closed_result_of(src.pixels()));
}

/* The scaled texture is kept between calls: whatever sizes come in turn and
 * however the file changes (same length, other bytes; gone; cut short),
 * each call gets the texture a first call would. */
TEST_F(Dispatch, SketchTextureKeptOnlyWhileFileAndSizeMatch)
{
	const std::string path = "/tmp/sketch-texture-kept-" + std::to_string(getpid());
	iel_sketch_texture_path_set(path.c_str());
	const std::vector<uint8_t> first = random_picture(589824, 1, 21, IEL_FORMAT_RGB888, 1).pixels();
	std::vector<uint8_t> second = first;
	second[589823] ^= 1;
	second[0] ^= 0x80;
	struct Step { uint32_t w, h; const std::vector<uint8_t> *content; size_t bytes; };
	const Step steps[] = {{9, 7, &first, 589824}, {40, 3, &first, 589824}, {9, 7, &first, 589824}, {9, 2, &first, 589824},
			      {9, 7, &first, 589824}, {3, 7, &first, 589824}, {9, 7, &first, 589824}, {1, 1, &first, 589824},
			      {9, 7, &second, 589824}, {1, 1, &second, 589824}, {9, 7, nullptr, 0}, {9, 7, &first, 589823},
			      {9, 7, &first, 589824}, {1, 1, &first, 589824}};
	int n = 0;
	for (const Step &step : steps) {
		const std::string at = "step " + std::to_string(n++);
		if (step.content)
			write_file(path, *step.content, step.bytes);
		else
			remove(path.c_str());
		closed_calls.clear();
		Picture src = random_picture(step.w, step.h, 30 + n), out = zeroed_picture(step.w, step.h);
		const bool usable = step.content && step.bytes == 589824;
		ASSERT_EQ(IEL_Sketch(&src.record, &out.record), usable ? IEL_OK : IEL_ERR_FILE) << at;
		if (!usable) {
			EXPECT_TRUE(closed_calls.empty() && out.pixels() == std::vector<uint8_t>(out.size, 0)) << at;
			continue;
		}
		ASSERT_EQ(closed_calls.size(), 1u) << at;
		EXPECT_EQ(closed_calls[0].texture_pixels, scaled_texture(*step.content, step.w, step.h)) << at;
		EXPECT_EQ(out.pixels(), closed_result_of(src.pixels())) << at;
	}
	remove(path.c_str());
}

/* Every picture size from one pixel up, odd widths included: the closed
 * engine gets the picture's RGB, and its RGB comes back opaque, nothing
 * written past the output. */
TEST_F(Dispatch, WrappersConvertEverySize)
{
	for (uint32_t h = 1; h <= 5; h++)
		for (uint32_t w = 1; w <= 37; w += (w < 12 ? 1 : 5)) {
			Picture src = random_picture(w, h, w * 13 + h), out(w, h);
			closed_calls.clear();
			ASSERT_EQ(IEL_Magic_Pen(&src.record, &out.record), IEL_OK);
			ASSERT_EQ(closed_calls.size(), 1u);
			std::vector<uint8_t> rgb;
			for (size_t i = 0; i < src.size; i += 4)
				rgb.insert(rgb.end(), {src.bytes[i + 2], src.bytes[i + 1], src.bytes[i]});
			EXPECT_EQ(closed_calls[0].input_pixels, rgb) << w << "x" << h;
			EXPECT_TRUE(out.pixels() == closed_result_of(src.pixels()) && out.guard_intact()) << w << "x" << h;
		}
}

/* Callers on several threads at once: one works with the kept buffers and
 * texture, the others from scratch, and each gets its own picture's result. */
TEST_F(Dispatch, WrappersOnSeveralThreads)
{
	const std::string path = "/tmp/sketch-texture-threads-" + std::to_string(getpid());
	iel_sketch_texture_path_set(path.c_str());
	const std::vector<uint8_t> content = random_picture(589824, 1, 41, IEL_FORMAT_RGB888, 1).pixels();
	write_file(path, content, content.size());
	std::vector<std::vector<uint8_t>> textures;
	for (uint32_t t = 0; t < 4; t++)
		textures.push_back(scaled_texture(content, 20 + t, 9 - t));
	std::vector<std::thread> threads;
	std::vector<int> failures(4, 0);
	for (uint32_t t = 0; t < 4; t++)
		threads.emplace_back([t, &failures] {
			for (int i = 0; i < 50; i++) {
				Picture src = random_picture(20 + t, 9 - t, t * 100 + i), out = zeroed_picture(20 + t, 9 - t);
				const int result = i % 2 ? IEL_Sketch(&src.record, &out.record) : IEL_Cartoon(&src.record, &out.record);
				failures[t] += result != IEL_OK || out.pixels() != closed_result_of(src.pixels());
			}
		});
	for (std::thread &thread : threads)
		thread.join();
	remove(path.c_str());
	EXPECT_EQ(failures, std::vector<int>(4, 0));
	for (const ClosedCall &call : closed_calls) {
		if (call.param.u16EffectId == IEL_EFFECT_ID_SKETCH) {
			EXPECT_EQ(call.texture_pixels, textures[call.texture.u32Width - 20]);
		}
	}
}
