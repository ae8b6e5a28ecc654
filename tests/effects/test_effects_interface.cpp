/* IEL_Apply_Effect's contract with the editor's wrappers, and the sketch
 * texture the build generates. */
#include <cstdio>

#include "effects-test-util.h"

namespace effects_test {
namespace {

constexpr int kW = 48;
constexpr int kH = 36;

struct Call {
	Bytes in = bgra_to_rgb(photo(kW, kH));
	Bytes out = Bytes(size_t(kW) * kH * 3, 0x3c);
	Bytes texture = paper(kW, kH);
	int32_t option = 2;
	IEL_Image input{kW, kH, IEL_FORMAT_RGB888, in.data()};
	IEL_Image output{kW, kH, IEL_FORMAT_RGB888, out.data()};
	IEL_Image paper_record{kW, kH, IEL_FORMAT_BGRA8888, texture.data()};
	IEL_EffectParam param{};
	IEL_Image *input_arg = &input, *output_arg = &output;
	IEL_EffectParam *param_arg = &param;

	explicit Call(int id)
	{
		param.u16EffectId = uint16_t(id);
		param.ps32Option = &option;
		param.pstTexture = &paper_record;
	}
	int apply() { return IEL_Apply_Effect(input_arg, output_arg, param_arg); }
	bool untouched() const { return out == Bytes(size_t(kW) * kH * 3, 0x3c); }
};

TEST(ApplyEffect, RefusesUnknownIdsAndUnusableRequestsWithoutWriting)
{
	using Breakage = std::pair<const char *, std::function<void(Call &)>>;
	const std::vector<Breakage> any_effect = {
		{"unknown id 0", [](Call &c) { c.param.u16EffectId = 0; }},
		{"unknown id 5", [](Call &c) { c.param.u16EffectId = 5; }},
		{"unknown id 65535", [](Call &c) { c.param.u16EffectId = 65535; }},
		{"no input record", [](Call &c) { c.input_arg = nullptr; }},
		{"no output record", [](Call &c) { c.output_arg = nullptr; }},
		{"no parameters", [](Call &c) { c.param_arg = nullptr; }},
		{"no input buffer", [](Call &c) { c.input.pbBuf = nullptr; }},
		{"no output buffer", [](Call &c) { c.output.pbBuf = nullptr; }},
		{"BGRA input", [](Call &c) { c.input.eFormat = IEL_FORMAT_BGRA8888; }},
		{"RGB565 output", [](Call &c) { c.output.eFormat = IEL_FORMAT_RGB565; }},
		{"output narrower", [](Call &c) { c.output.u32Width = kW - 1; }},
		{"output taller", [](Call &c) { c.output.u32Height = kH + 1; }},
		{"empty picture", [](Call &c) { c.input.u32Width = c.output.u32Width = 0; }},
		{"overflowing size",
		 [](Call &c) { c.input.u32Width = c.output.u32Width = c.input.u32Height = c.output.u32Height = 1u << 31; }},
	};
	const std::vector<Breakage> sketch_only = {
		{"no texture", [](Call &c) { c.param.pstTexture = nullptr; }},
		{"no texture pixels", [](Call &c) { c.paper_record.pbBuf = nullptr; }},
		{"RGB texture", [](Call &c) { c.paper_record.eFormat = IEL_FORMAT_RGB888; }},
		{"texture smaller", [](Call &c) { c.paper_record.u32Width = kW / 2; }},
	};
	for (int id : {IEL_EFFECT_ID_MAGIC_PEN, IEL_EFFECT_ID_SKETCH, IEL_EFFECT_ID_CARTOON, IEL_EFFECT_ID_OIL_PAINT}) {
		std::vector<Breakage> breakages = any_effect;
		if (id == IEL_EFFECT_ID_SKETCH)
			breakages.insert(breakages.end(), sketch_only.begin(), sketch_only.end());
		for (auto &[what, breakage] : breakages) {
			Call call(id);
			breakage(call);
			EXPECT_NE(call.apply(), 0) << id << ": " << what;
			EXPECT_TRUE(call.untouched()) << id << ": " << what;
		}
	}
}

TEST(ApplyEffect, OptionSetsTheWeightDefaultsToMediumAndIsChecked)
{
	for (int id : {IEL_EFFECT_ID_SKETCH, IEL_EFFECT_ID_CARTOON}) {
		Call light(id), medium(id), strong(id), unset(id), zero(id), four(id);
		light.option = 1;
		strong.option = 3;
		zero.option = 0;
		four.option = 4;
		EXPECT_TRUE(zero.apply() != 0 && four.apply() != 0 && zero.untouched() && four.untouched()) << id;
		unset.param.ps32Option = nullptr;
		ASSERT_EQ(light.apply() | medium.apply() | strong.apply() | unset.apply(), 0) << id;
		EXPECT_TRUE(unset.out == medium.out) << id;
		EXPECT_FALSE(light.out == strong.out) << id;
	}
}

TEST(EffectTexture, SketchPaperIsLightWithPencilStrokes)
{
	FILE *file = std::fopen(IE_SKETCH_TEXTURE, "rb");
	ASSERT_NE(file, nullptr) << IE_SKETCH_TEXTURE;
	Bytes bytes(589824 + 1);
	const size_t got = std::fread(bytes.data(), 1, bytes.size(), file);
	std::fclose(file);
	ASSERT_EQ(got, 589824u);
	size_t light = 0, stroke = 0;
	for (size_t i = 0; i < got; i += 3) {
		int l = (bytes[i] + bytes[i + 1] + bytes[i + 2]) / 3;
		light += l > 215;
		stroke += l < 170;
	}
	EXPECT_GT(light, got / 6) << "mostly paper";
	EXPECT_GT(stroke, got / 150) << "with visible strokes";
}

} // namespace
} // namespace effects_test
