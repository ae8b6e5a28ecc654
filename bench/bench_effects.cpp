/* Every effect of the catalogue at the editor's full picture size (1280 x
 * 960 BGRA), each timed twice: /0 on one thread (the processor time of the
 * calling thread; the goals are these) and /1 with every core allowed (wall
 * time; OpenCV spreads its work, our routines use one thread). Counters:
 * ms, x_blur11 (against cv::blur 11x11 in the same mode; goal: within 16 ms)
 * and, for colour and tone effects, x_transform (against cv::transform with
 * a 4x4 matrix; goal: at most 0.5). The library effects are called as the
 * dispatcher calls them; the engine's own (sepia, posterise, blur) and the
 * RGB888 wrappers' full cost through IEL_Run_Effect. */
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>

#include <chrono>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "PhotoEditorEngine.h"
#include "bench-common.h"
#include "ie-engine.h"
#include "photoeditoreffects.h"

namespace {

constexpr int kW = bench::kPhotoWidth;
constexpr int kH = bench::kPhotoHeight;
constexpr const char *kTransform = "effects-transform4x4/";
constexpr const char *kBlur = "effects-blur11/";

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

bool all_cores(const benchmark::State &state)
{
	return state.range(0) == 1;
}

std::string mode(const benchmark::State &state)
{
	return std::to_string(state.range(0));
}

/* Mean seconds per iteration: this thread's processor time on one core,
 * wall time when every core is allowed (the work may run elsewhere). */
template <class Body>
double measure(benchmark::State &state, Body &&body)
{
	cv::setNumThreads(all_cores(state) ? int(std::thread::hardware_concurrency()) : 1);
	if (!all_cores(state))
		return bench::timed_loop(state, body);
	const auto start = std::chrono::steady_clock::now();
	for (auto _ : state)
		body();
	const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - start;
	return state.iterations() ? elapsed.count() / double(state.iterations()) : 0.0;
}

void report(benchmark::State &state, double seconds, bool tone)
{
	state.counters["ms"] = seconds * 1e3;
	bench::report_ratio(state, "x_blur11", seconds, kBlur + mode(state));
	if (tone)
		bench::report_ratio(state, "x_transform", seconds, kTransform + mode(state));
}

void BM_Effects_CvTransform4x4(benchmark::State &state)
{
	cv::Mat src(kH, kW, CV_8UC4, const_cast<uint8_t *>(photo().data()));
	cv::Mat dst(kH, kW, CV_8UC4, output(size_t(kW) * kH * 4).data());
	const cv::Matx44f sepia(0.272f, 0.534f, 0.131f, 0.f, 0.349f, 0.686f, 0.168f, 0.f, 0.393f, 0.769f, 0.189f, 0.f,
				0.f, 0.f, 0.f, 1.f);
	const double seconds = measure(state, [&] {
		cv::transform(src, dst, sepia);
		benchmark::DoNotOptimize(dst.data);
	});
	bench::record_reference(kTransform + mode(state), seconds);
	state.counters["ms"] = seconds * 1e3;
}
BENCHMARK(BM_Effects_CvTransform4x4)->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

void BM_Effects_CvBlur11(benchmark::State &state)
{
	cv::Mat src(kH, kW, CV_8UC4, const_cast<uint8_t *>(photo().data()));
	cv::Mat dst(kH, kW, CV_8UC4, output(size_t(kW) * kH * 4).data());
	const double seconds = measure(state, [&] {
		cv::blur(src, dst, cv::Size(11, 11));
		benchmark::DoNotOptimize(dst.data);
	});
	bench::record_reference(kBlur + mode(state), seconds);
	state.counters["ms"] = seconds * 1e3;
}
BENCHMARK(BM_Effects_CvBlur11)->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

using BgraEffect = std::function<int(const unsigned char *, unsigned char *, int, int)>;

void bgra(benchmark::State &state, const BgraEffect &effect, bool tone)
{
	std::vector<uint8_t> &out = output(size_t(kW) * kH * 4);
	const double seconds = measure(state, [&] {
		effect(photo().data(), out.data(), kW, kH);
		benchmark::DoNotOptimize(out.data());
	});
	report(state, seconds, tone);
}

void tone(benchmark::State &state, const BgraEffect &effect)
{
	bgra(state, effect, true);
}

void spatial(benchmark::State &state, const BgraEffect &effect)
{
	bgra(state, effect, false);
}

/* An RGB888 effect of the engine library on the records IEL_Apply_Effect
 * takes, without the wrappers' conversions. */
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
	const double seconds = measure(state, [&] {
		failed |= IEL_Apply_Effect(&in, &result, &param);
		benchmark::DoNotOptimize(out.data());
	});
	if (failed)
		state.SkipWithError("IEL_Apply_Effect failed");
	report(state, seconds, false);
}

/* The whole catalogue entry as the editor runs it. */
void dispatch(benchmark::State &state, unsigned int code, bool is_tone)
{
	std::vector<uint8_t> &out = output(size_t(kW) * kH * 4);
	IEL_Image in{kW, kH, IEL_FORMAT_BGRA8888, const_cast<uint8_t *>(photo().data())};
	IEL_Image result{kW, kH, IEL_FORMAT_BGRA8888, out.data()};
	int failed = 0;
	const double seconds = measure(state, [&] {
		failed |= IEL_Run_Effect(&in, &result, code);
		benchmark::DoNotOptimize(out.data());
	});
	if (failed)
		state.SkipWithError("IEL_Run_Effect failed");
	report(state, seconds, is_tone);
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
void BM_Effects_Sepia(benchmark::State &s) { dispatch(s, IE_EFFECT_SEPIA, true); }
void BM_Effects_Posterise(benchmark::State &s) { dispatch(s, IE_EFFECT_POSTERISE, true); }
void BM_Effects_Blur(benchmark::State &s) { dispatch(s, IE_EFFECT_BLUR, false); }
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
/* The RGB888 wrappers with their conversions (and the sketch's texture file
 * read and scaled on every call). */
void BM_Effects_Dispatch_MagicPen(benchmark::State &s) { dispatch(s, IE_EFFECT_MAGIC_PEN, false); }
void BM_Effects_Dispatch_Sketch(benchmark::State &s) { dispatch(s, IE_EFFECT_SKETCH, false); }
void BM_Effects_Dispatch_Cartoon(benchmark::State &s) { dispatch(s, IE_EFFECT_CARTOON, false); }
void BM_Effects_Dispatch_OilPaint(benchmark::State &s) { dispatch(s, IE_EFFECT_OIL_PAINT, false); }

#define EFFECT_BENCHMARK(name) BENCHMARK(name)->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond)
EFFECT_BENCHMARK(BM_Effects_Vintage);
EFFECT_BENCHMARK(BM_Effects_OldPhoto);
EFFECT_BENCHMARK(BM_Effects_PopArt);
EFFECT_BENCHMARK(BM_Effects_Negative);
EFFECT_BENCHMARK(BM_Effects_Retro);
EFFECT_BENCHMARK(BM_Effects_Bluewash);
EFFECT_BENCHMARK(BM_Effects_Sunshine);
EFFECT_BENCHMARK(BM_Effects_Nostalgia);
EFFECT_BENCHMARK(BM_Effects_Downlight);
EFFECT_BENCHMARK(BM_Effects_YellowGlow);
EFFECT_BENCHMARK(BM_Effects_Greyscale);
EFFECT_BENCHMARK(BM_Effects_FadedColours);
EFFECT_BENCHMARK(BM_Effects_Sepia);
EFFECT_BENCHMARK(BM_Effects_Posterise);
EFFECT_BENCHMARK(BM_Effects_Blur);
EFFECT_BENCHMARK(BM_Effects_SoftGlow);
EFFECT_BENCHMARK(BM_Effects_Sharpen);
EFFECT_BENCHMARK(BM_Effects_MagicPen);
EFFECT_BENCHMARK(BM_Effects_Sketch);
EFFECT_BENCHMARK(BM_Effects_Cartoon);
EFFECT_BENCHMARK(BM_Effects_OilPaint);
EFFECT_BENCHMARK(BM_Effects_Dispatch_MagicPen);
EFFECT_BENCHMARK(BM_Effects_Dispatch_Sketch);
EFFECT_BENCHMARK(BM_Effects_Dispatch_Cartoon);
EFFECT_BENCHMARK(BM_Effects_Dispatch_OilPaint);

} // namespace
