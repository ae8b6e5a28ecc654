/* The effect libraries at the editor's full picture size (1280 x 960 BGRA,
 * single thread). Colour and tone effects report their time as a ratio to
 * cv::transform with a 4x4 matrix on the same picture (x_transform, target
 * at most 1.0); spatial effects as a ratio to cv::blur 11x11 (x_blur11,
 * target within 50 ms here). The spatial effects of the engine library are
 * timed on the RGB888 records IEL_Apply_Effect takes. */
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>

#include <functional>
#include <vector>

#include "PhotoEditorEngine.h"
#include "bench-common.h"
#include "photoeditoreffects.h"

namespace {

constexpr int kW = bench::kPhotoWidth;
constexpr int kH = bench::kPhotoHeight;
constexpr const char *kTransform = "effects-transform4x4";
constexpr const char *kBlur = "effects-blur11";

const std::vector<uint8_t> &photo()
{
	static const std::vector<uint8_t> pixels = bench::photo_bgra();
	return pixels;
}

const std::vector<uint8_t> &photo_rgb()
{
	static const std::vector<uint8_t> pixels = [] {
		const std::vector<uint8_t> &bgra = photo();
		std::vector<uint8_t> rgb(size_t(kW) * kH * 3);
		for (size_t i = 0; i < size_t(kW) * kH; ++i) {
			rgb[i * 3] = bgra[i * 4 + 2];
			rgb[i * 3 + 1] = bgra[i * 4 + 1];
			rgb[i * 3 + 2] = bgra[i * 4];
		}
		return rgb;
	}();
	return pixels;
}

/* Output buffers live across iterations, touched before timing. */
std::vector<uint8_t> &output(size_t bytes)
{
	static std::vector<uint8_t> buffer;
	if (buffer.size() < bytes)
		buffer.assign(bytes, 1);
	return buffer;
}

void BM_Effects_CvTransform4x4(benchmark::State &state)
{
	cv::setNumThreads(1);
	cv::Mat src(kH, kW, CV_8UC4, const_cast<uint8_t *>(photo().data()));
	cv::Mat dst(kH, kW, CV_8UC4, output(size_t(kW) * kH * 4).data());
	const cv::Matx44f sepia(0.272f, 0.534f, 0.131f, 0.f, 0.349f, 0.686f, 0.168f, 0.f, 0.393f, 0.769f, 0.189f, 0.f,
				0.f, 0.f, 0.f, 1.f);
	bench::record_reference(kTransform, bench::timed_loop(state, [&] {
		cv::transform(src, dst, sepia);
		benchmark::DoNotOptimize(dst.data);
	}));
}
BENCHMARK(BM_Effects_CvTransform4x4)->Unit(benchmark::kMillisecond);

void BM_Effects_CvBlur11(benchmark::State &state)
{
	cv::setNumThreads(1);
	cv::Mat src(kH, kW, CV_8UC4, const_cast<uint8_t *>(photo().data()));
	cv::Mat dst(kH, kW, CV_8UC4, output(size_t(kW) * kH * 4).data());
	bench::record_reference(kBlur, bench::timed_loop(state, [&] {
		cv::blur(src, dst, cv::Size(11, 11));
		benchmark::DoNotOptimize(dst.data);
	}));
}
BENCHMARK(BM_Effects_CvBlur11)->Unit(benchmark::kMillisecond);

using BgraEffect = std::function<int(const unsigned char *, unsigned char *, int, int)>;

void run_bgra(benchmark::State &state, const BgraEffect &effect, const char *yardstick, const char *counter)
{
	std::vector<uint8_t> &out = output(size_t(kW) * kH * 4);
	double seconds = bench::timed_loop(state, [&] {
		effect(photo().data(), out.data(), kW, kH);
		benchmark::DoNotOptimize(out.data());
	});
	bench::report_ratio(state, counter, seconds, yardstick);
}

void tone(benchmark::State &state, const BgraEffect &effect)
{
	run_bgra(state, effect, kTransform, "x_transform");
}

void spatial(benchmark::State &state, const BgraEffect &effect)
{
	run_bgra(state, effect, kBlur, "x_blur11");
}

void engine(benchmark::State &state, int id)
{
	std::vector<uint8_t> out(size_t(kW) * kH * 3, 1);
	/* The sketch's texture: paper with diagonal strokes, as the editor
	 * hands it over at the picture's size. */
	std::vector<uint8_t> texture(size_t(kW) * kH * 4);
	for (size_t i = 0; i < size_t(kW) * kH; ++i) {
		uint8_t v = ((i % kW) + (i / kW)) % 9 == 0 ? 120 : 236;
		texture[i * 4] = texture[i * 4 + 1] = texture[i * 4 + 2] = v;
		texture[i * 4 + 3] = 255;
	}
	IEL_Image in{kW, kH, IEL_FORMAT_RGB888, const_cast<uint8_t *>(photo_rgb().data())};
	IEL_Image result{kW, kH, IEL_FORMAT_RGB888, out.data()};
	IEL_Image paper{kW, kH, IEL_FORMAT_BGRA8888, texture.data()};
	int32_t option = 2;
	IEL_EffectParam param{};
	param.u16EffectId = uint16_t(id);
	param.ps32Option = &option;
	param.pstTexture = &paper;
	int failed = 0;
	double seconds = bench::timed_loop(state, [&] {
		failed |= IEL_Apply_Effect(&in, &result, &param);
		benchmark::DoNotOptimize(out.data());
	});
	if (failed)
		state.SkipWithError("IEL_Apply_Effect failed");
	bench::report_ratio(state, "x_blur11", seconds, kBlur);
}

void BM_Effects_Vintage(benchmark::State &s) { tone(s, applyVintage); }
void BM_Effects_OldPhoto(benchmark::State &s) { tone(s, applyOldPhoto); }
void BM_Effects_PopArt(benchmark::State &s) { tone(s, applyPopArt); }
void BM_Effects_Negative(benchmark::State &s) { tone(s, applyInvert); }
void BM_Effects_Retro(benchmark::State &s) { tone(s, applyRetro); }
void BM_Effects_Bluewash(benchmark::State &s) { tone(s, applyBluewash); }
void BM_Effects_Sunshine(benchmark::State &s) { tone(s, applySunshine); }
void BM_Effects_Nostalgia(benchmark::State &s) { tone(s, applyNostalgia); }
void BM_Effects_Downlight(benchmark::State &s) { tone(s, applyDownlight); }
void BM_Effects_YellowGlow(benchmark::State &s) { tone(s, applyYellowglow); }
void BM_Effects_Greyscale(benchmark::State &s)
{
	tone(s, [](const unsigned char *i, unsigned char *o, int w, int h) { return controlGreyscale(i, o, w, h, 10); });
}
void BM_Effects_FadedColours(benchmark::State &s)
{
	tone(s, [](const unsigned char *i, unsigned char *o, int w, int h) { return controlFadedColour(i, o, w, h, 50); });
}
void BM_Effects_SoftGlow(benchmark::State &s)
{
	spatial(s, [](const unsigned char *i, unsigned char *o, int w, int h) { return applySoftglow(i, o, w, h, 100); });
}
void BM_Effects_Sharpen(benchmark::State &s)
{
	spatial(s, [](const unsigned char *i, unsigned char *o, int w, int h) { return mi_apply_sharpen_all(i, o, w, h, 4); });
}
void BM_Effects_MagicPen(benchmark::State &s) { engine(s, IEL_EFFECT_ID_MAGIC_PEN); }
void BM_Effects_Sketch(benchmark::State &s) { engine(s, IEL_EFFECT_ID_SKETCH); }
void BM_Effects_Cartoon(benchmark::State &s) { engine(s, IEL_EFFECT_ID_CARTOON); }
void BM_Effects_OilPaint(benchmark::State &s) { engine(s, IEL_EFFECT_ID_OIL_PAINT); }

BENCHMARK(BM_Effects_Vintage)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_OldPhoto)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_PopArt)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Negative)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Retro)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Bluewash)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Sunshine)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Nostalgia)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Downlight)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_YellowGlow)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Greyscale)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_FadedColours)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_SoftGlow)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Sharpen)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_MagicPen)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Sketch)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_Cartoon)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Effects_OilPaint)->Unit(benchmark::kMillisecond);

} // namespace
