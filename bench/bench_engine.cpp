/* The image engine against OpenCV and memcpy on the same buffers, single
 * thread, at the sizes the editor uses. Each of our benchmarks reports its
 * time as a ratio to the OpenCV operation (x_cv) and to a memcpy of the
 * same picture (x_memcpy); the plain reference loops are shown for scale. */
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>

#include <cstring>
#include <vector>

#include "bench-common.h"
#include "ie-engine-private.h"
#include "ie-engine.h"

namespace {

constexpr int kW = bench::kPhotoWidth;
constexpr int kH = bench::kPhotoHeight;
constexpr int kLargeW = 4000;
constexpr int kLargeH = 3000;
constexpr int kThumbW = 157;
constexpr int kThumbH = 118;
constexpr int kCropW = 640;
constexpr int kCropH = 480;
constexpr int kCropX = 320;
constexpr int kCropY = 240;

const std::vector<uint8_t> &photo()
{
	static const std::vector<uint8_t> pixels = bench::photo_bgra();
	return pixels;
}

const std::vector<uint8_t> &second_photo()
{
	static const std::vector<uint8_t> pixels = bench::photo_bgra(kW, kH, 777);
	return pixels;
}

const std::vector<uint8_t> &large_photo()
{
	static const std::vector<uint8_t> pixels = bench::photo_bgra(kLargeW, kLargeH, 4242);
	return pixels;
}

/* Output buffers live across iterations, touched once before timing, so
 * that no run pays for fresh pages. */
std::vector<uint8_t> &output(size_t bytes, int slot = 0)
{
	static std::vector<uint8_t> buffers[2];
	if (buffers[slot].size() < bytes)
		buffers[slot].assign(bytes, 1);
	return buffers[slot];
}

IEL_Image record(const std::vector<uint8_t> &pixels, int width, int height)
{
	return {static_cast<uint32_t>(width), static_cast<uint32_t>(height), IEL_FORMAT_BGRA8888,
		const_cast<uint8_t *>(pixels.data())};
}

cv::Mat mat(const std::vector<uint8_t> &pixels, int width, int height)
{
	return cv::Mat(height, width, CV_8UC4, const_cast<uint8_t *>(pixels.data()));
}

void single_thread()
{
	cv::setNumThreads(1);
}

void report(benchmark::State &state, double seconds, const std::string &yardstick, const std::string &copy)
{
	bench::report_ratio(state, "x_cv", seconds, yardstick);
	bench::report_ratio(state, "x_memcpy", seconds, copy);
}

void Memcpy_1280x960(benchmark::State &state)
{
	const std::vector<uint8_t> &src = photo();
	std::vector<uint8_t> &dst = output(src.size());
	bench::record_reference("memcpy", bench::timed_loop(state, [&] {
		std::memcpy(dst.data(), src.data(), src.size());
		benchmark::ClobberMemory();
	}));
}

void Memcpy_4000x3000(benchmark::State &state)
{
	const std::vector<uint8_t> &src = large_photo();
	static std::vector<uint8_t> dst(src.size(), 1);
	bench::record_reference("memcpy-large", bench::timed_loop(state, [&] {
		std::memcpy(dst.data(), src.data(), src.size());
		benchmark::ClobberMemory();
	}));
}

void Memcpy_640x480(benchmark::State &state)
{
	const std::vector<uint8_t> &src = photo();
	std::vector<uint8_t> &dst = output(kCropW * kCropH * 4);
	bench::record_reference("memcpy-crop", bench::timed_loop(state, [&] {
		std::memcpy(dst.data(), src.data(), kCropW * kCropH * 4);
		benchmark::ClobberMemory();
	}));
}

/* Resize 4000 x 3000 to 1280 x 960: picture loading's reduction. */
void CV_Resize_4000x3000_to_1280x960(benchmark::State &state)
{
	single_thread();
	cv::Mat src = mat(large_photo(), kLargeW, kLargeH);
	cv::Mat dst = mat(output(kW * kH * 4), kW, kH);
	bench::record_reference("resize", bench::timed_loop(state, [&] {
		cv::resize(src, dst, dst.size(), 0, 0, cv::INTER_LINEAR);
	}));
}

void IEL_Resize_4000x3000_to_1280x960(benchmark::State &state)
{
	IEL_Image src = record(large_photo(), kLargeW, kLargeH);
	IEL_Image dst = record(output(kW * kH * 4), kW, kH);
	report(state, bench::timed_loop(state, [&] { IEL_Resize_Image(&src, &dst); }), "resize", "memcpy");
}

void Ref_Resize_4000x3000_to_1280x960(benchmark::State &state)
{
	const std::vector<uint8_t> &src = large_photo();
	std::vector<uint8_t> &dst = output(kW * kH * 4);
	report(state, bench::timed_loop(state, [&] {
		iel_resize_reference(src.data(), kLargeW, kLargeH, dst.data(), kW, kH);
	}), "resize", "memcpy");
}

/* Resize 1280 x 960 to the effect thumbnail size. */
void CV_Resize_1280x960_to_157x118(benchmark::State &state)
{
	single_thread();
	cv::Mat src = mat(photo(), kW, kH);
	cv::Mat dst = mat(output(kThumbW * kThumbH * 4), kThumbW, kThumbH);
	bench::record_reference("thumbnail", bench::timed_loop(state, [&] {
		cv::resize(src, dst, dst.size(), 0, 0, cv::INTER_LINEAR);
	}));
}

void IEL_Resize_1280x960_to_157x118(benchmark::State &state)
{
	IEL_Image src = record(photo(), kW, kH);
	IEL_Image dst = record(output(kThumbW * kThumbH * 4), kThumbW, kThumbH);
	report(state, bench::timed_loop(state, [&] { IEL_Resize_Image(&src, &dst); }), "thumbnail", "memcpy");
}

/* Quarter turns of the whole picture (rotate view). */
void CV_Rotate_1280x960_Right(benchmark::State &state)
{
	single_thread();
	cv::Mat src = mat(photo(), kW, kH);
	cv::Mat dst = mat(output(kW * kH * 4), kH, kW);
	bench::record_reference("rotate", bench::timed_loop(state, [&] {
		cv::rotate(src, dst, cv::ROTATE_90_CLOCKWISE);
	}));
}

void IEL_Rotate_1280x960_Right(benchmark::State &state)
{
	IEL_Image src = record(photo(), kW, kH);
	IEL_Image dst = record(output(kW * kH * 4), kH, kW);
	report(state, bench::timed_loop(state, [&] { IEL_Rotate_Image(&src, &dst, 1); }), "rotate", "memcpy");
}

void IEL_Rotate_1280x960_Left(benchmark::State &state)
{
	IEL_Image src = record(photo(), kW, kH);
	IEL_Image dst = record(output(kW * kH * 4), kH, kW);
	report(state, bench::timed_loop(state, [&] { IEL_Rotate_Image(&src, &dst, 3); }), "rotate", "memcpy");
}

void Ref_Rotate_1280x960_Right(benchmark::State &state)
{
	const std::vector<uint8_t> &src = photo();
	std::vector<uint8_t> &dst = output(kW * kH * 4);
	report(state, bench::timed_loop(state, [&] { iel_rotate_reference(src.data(), dst.data(), kW, kH, 4, 1); }),
	       "rotate", "memcpy");
}

/* 11 x 11 box blur (effect code 14). The row-sum buffer is the caller's and
 * is reused, as the routine's interface intends. */
void CV_Blur11_1280x960(benchmark::State &state)
{
	single_thread();
	cv::Mat src = mat(photo(), kW, kH);
	cv::Mat dst = mat(output(kW * kH * 4), kW, kH);
	bench::record_reference("blur", bench::timed_loop(state, [&] {
		cv::blur(src, dst, cv::Size(11, 11), cv::Point(-1, -1), cv::BORDER_REPLICATE);
	}));
}

void IEL_Blur11_1280x960(benchmark::State &state)
{
	IEL_Image src = record(photo(), kW, kH);
	IEL_Image dst = record(output(kW * kH * 4), kW, kH);
	IEL_RowSumBufInfo info = {nullptr, 0};
	report(state, bench::timed_loop(state, [&] { IEL_Variable_Blur_BGRA888_skip(&src, &dst, &info, 4, 1, 1); }),
	       "blur", "memcpy");
	free(info.ps32Buf);
}

void Ref_Blur11_1280x960(benchmark::State &state)
{
	const std::vector<uint8_t> &src = photo();
	std::vector<uint8_t> &dst = output(kW * kH * 4);
	std::vector<int32_t> planes((kW + 15) * 4);
	report(state, bench::timed_loop(state, [&] {
		iel_blur_reference(src.data(), dst.data(), kW, kH, planes.data(), 5, 1, 1);
	}), "blur", "memcpy");
}

/* Blend at intensity 50 (effect slider). */
void CV_Blend_1280x960(benchmark::State &state)
{
	single_thread();
	cv::Mat effect = mat(second_photo(), kW, kH);
	cv::Mat unedited = mat(photo(), kW, kH);
	cv::Mat dst = mat(output(kW * kH * 4), kW, kH);
	bench::record_reference("blend", bench::timed_loop(state, [&] {
		cv::addWeighted(effect, 127 / 256.0, unedited, 128 / 256.0, 0.0, dst);
	}));
}

void IEL_Blend_1280x960(benchmark::State &state)
{
	IEL_Image effect = record(second_photo(), kW, kH);
	std::vector<uint8_t> &inout = output(kW * kH * 4);
	std::memcpy(inout.data(), photo().data(), photo().size());
	IEL_Image unedited = record(inout, kW, kH);
	report(state, bench::timed_loop(state, [&] { IEL_Alpha_blending(&effect, &unedited, 50.0f); }), "blend",
	       "memcpy");
}

void Ref_Blend_1280x960(benchmark::State &state)
{
	std::vector<uint8_t> &inout = output(kW * kH * 4);
	std::memcpy(inout.data(), photo().data(), photo().size());
	report(state, bench::timed_loop(state, [&] {
		iel_blend_reference(second_photo().data(), inout.data(), inout.size(), 127);
	}), "blend", "memcpy");
}

/* Sepia (effect code 4) against a 4 x 4 colour matrix. */
void CV_Transform_1280x960(benchmark::State &state)
{
	single_thread();
	cv::Mat src = mat(photo(), kW, kH);
	cv::Mat dst = mat(output(kW * kH * 4), kW, kH);
	const cv::Matx44f sepia(0.114f, 0.587f, 0.299f, 0, 0.114f, 0.587f, 0.299f, 0, 0.114f, 0.587f, 0.299f, 0, 0, 0, 0, 1);
	bench::record_reference("sepia", bench::timed_loop(state, [&] { cv::transform(src, dst, sepia); }));
}

void IEL_Sepia_1280x960(benchmark::State &state)
{
	const std::vector<uint8_t> &src = photo();
	std::vector<uint8_t> &dst = output(kW * kH * 4);
	report(state, bench::timed_loop(state, [&] { iel_sepia_fast(src.data(), dst.data(), kW * kH, 4); }), "sepia",
	       "memcpy");
}

void Ref_Sepia_1280x960(benchmark::State &state)
{
	const std::vector<uint8_t> &src = photo();
	std::vector<uint8_t> &dst = output(kW * kH * 4);
	report(state, bench::timed_loop(state, [&] { iel_sepia_reference(src.data(), dst.data(), kW * kH, 4); }),
	       "sepia", "memcpy");
}

/* Posterise strength 2 (effect code 12) against a 256-entry cv::LUT. */
void CV_LUT_1280x960(benchmark::State &state)
{
	single_thread();
	cv::Mat src = mat(photo(), kW, kH);
	cv::Mat dst = mat(output(kW * kH * 4), kW, kH);
	cv::Mat table(1, 256, CV_8U);
	iel_posterize_table(2, table.ptr<uint8_t>());
	bench::record_reference("posterise", bench::timed_loop(state, [&] { cv::LUT(src, table, dst); }));
}

void IEL_Posterize_1280x960(benchmark::State &state)
{
	IEL_Image src = record(photo(), kW, kH);
	IEL_Image dst = record(output(kW * kH * 4), kW, kH);
	report(state, bench::timed_loop(state, [&] { IEL_Posterize(&src, &dst, 2); }), "posterise", "memcpy");
}

void Ref_Posterize_1280x960(benchmark::State &state)
{
	const std::vector<uint8_t> &src = photo();
	std::vector<uint8_t> &dst = output(kW * kH * 4);
	uint8_t table[256];
	iel_posterize_table(2, table);
	report(state, bench::timed_loop(state, [&] { iel_posterize_reference(src.data(), dst.data(), src.size(), table); }),
	       "posterise", "memcpy");
}

/* Crop of a 640 x 480 region (Done in the crop view). */
void CV_Crop_640x480(benchmark::State &state)
{
	single_thread();
	cv::Mat src = mat(photo(), kW, kH);
	cv::Mat dst = mat(output(kCropW * kCropH * 4), kCropW, kCropH);
	const cv::Rect region(kCropX, kCropY, kCropW, kCropH);
	bench::record_reference("crop", bench::timed_loop(state, [&] { src(region).copyTo(dst); }));
}

void IEL_Crop_640x480(benchmark::State &state)
{
	IEL_Image src = record(photo(), kW, kH);
	IEL_Image dst = record(output(kCropW * kCropH * 4), kCropW, kCropH);
	report(state, bench::timed_loop(state, [&] { IEL_Crop_Image(&src, &dst, kCropX, kCropY); }), "crop",
	       "memcpy-crop");
}

}

BENCHMARK(Memcpy_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Memcpy_640x480)->Unit(benchmark::kMillisecond);
BENCHMARK(Memcpy_4000x3000)->Unit(benchmark::kMillisecond);
BENCHMARK(CV_Resize_4000x3000_to_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(IEL_Resize_4000x3000_to_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Ref_Resize_4000x3000_to_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(CV_Resize_1280x960_to_157x118)->Unit(benchmark::kMillisecond);
BENCHMARK(IEL_Resize_1280x960_to_157x118)->Unit(benchmark::kMillisecond);
BENCHMARK(CV_Rotate_1280x960_Right)->Unit(benchmark::kMillisecond);
BENCHMARK(IEL_Rotate_1280x960_Right)->Unit(benchmark::kMillisecond);
BENCHMARK(IEL_Rotate_1280x960_Left)->Unit(benchmark::kMillisecond);
BENCHMARK(Ref_Rotate_1280x960_Right)->Unit(benchmark::kMillisecond);
BENCHMARK(CV_Blur11_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(IEL_Blur11_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Ref_Blur11_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(CV_Blend_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(IEL_Blend_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Ref_Blend_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(CV_Transform_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(IEL_Sepia_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Ref_Sepia_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(CV_LUT_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(IEL_Posterize_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Ref_Posterize_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(CV_Crop_640x480)->Unit(benchmark::kMillisecond);
BENCHMARK(IEL_Crop_640x480)->Unit(benchmark::kMillisecond);
