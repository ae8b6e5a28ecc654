/* Opening a picture in a 720x1280 box, as IE_setparam does it: from
 * creating the main image to the reduced picture's pixels in place (the
 * background decoding included), on four pictures made here: a baseline
 * 4000x3000 JPEG, a progressive 5640x3172 JPEG of quality 100, a 3000x4000
 * portrait JPEG and a 4000x3000 PNG. The yardstick is Debian's
 * vipsthumbnail making a 1280-pixel version of the same file on one
 * thread, run as the command a user would type. Each side is timed both
 * ways: processor time (all our threads; the child's user and system time)
 * and wall time. x_vipsthumbnail is the processor-time ratio, which a
 * machine busy with other work disturbs least; wall_x_vipsthumbnail the
 * wall-time one. Ours runs on one thread (threads:1) and on all cores
 * (threads:0), where the decoding may split its work; the processing
 * popup is built with the editor's theme, as in the editor.
 * Editor_Open_Quality gives, for each picture, the PSNR (blue, green and
 * red) of the picture put in place against OpenCV's area reduction of the
 * full-size decoding to the same size: how faithfully it is reduced. */
#include <Ecore_Evas.h>
#include <Elementary.h>

#include <jpeglib.h>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#include <png.h>
#include <spawn.h>
#include <stdlib.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

#include "bench-common.h"
#include "bench-efl.h"
#include "editor-svc-private.h"
#include "ie-engine-private.h"
#include "ie-image.h"

extern char **environ;

namespace {

constexpr int kBoxW = 720;
constexpr int kBoxH = 1280;
constexpr int kThumbnailSize = 1280;

enum class Kind { BASELINE, PROGRESSIVE, PNG };

struct Picture {
	const char *name;
	int w, h;
	Kind kind;
	int quality;
	uint32_t seed;
};

constexpr Picture kPictures[] = {
	{ "baseline_4000x3000", 4000, 3000, Kind::BASELINE, 90, 2024 },
	{ "progressive_q100_5640x3172", 5640, 3172, Kind::PROGRESSIVE, 100, 2025 },
	{ "portrait_3000x4000", 3000, 4000, Kind::BASELINE, 90, 2026 },
	{ "png_4000x3000", 4000, 3000, Kind::PNG, 0, 2027 },
};

const std::string &scratch_dir()
{
	static const std::string dir = [] {
		std::string d = std::filesystem::temp_directory_path() / "ie-bench-load-XXXXXX";
		if (!mkdtemp(d.data()))
			return std::string();
		static std::string scratch = d;
		std::atexit([] { std::filesystem::remove_all(scratch); });
		return d;
	}();
	return dir;
}

bool write_jpeg(const std::string &path, const std::vector<uint8_t> &bgra, const Picture &p)
{
	FILE *file = fopen(path.c_str(), "wb");
	if (!file)
		return false;
	jpeg_compress_struct cinfo;
	jpeg_error_mgr error;
	cinfo.err = jpeg_std_error(&error);
	jpeg_create_compress(&cinfo);
	jpeg_stdio_dest(&cinfo, file);
	cinfo.image_width = JDIMENSION(p.w);
	cinfo.image_height = JDIMENSION(p.h);
	cinfo.input_components = 4;
	cinfo.in_color_space = JCS_EXT_BGRA;
	jpeg_set_defaults(&cinfo);
	jpeg_set_quality(&cinfo, p.quality, TRUE);
	if (p.kind == Kind::PROGRESSIVE)
		jpeg_simple_progression(&cinfo);
	jpeg_start_compress(&cinfo, TRUE);
	while (cinfo.next_scanline < cinfo.image_height) {
		auto *row = const_cast<JSAMPLE *>(&bgra[size_t(cinfo.next_scanline) * p.w * 4]);
		jpeg_write_scanlines(&cinfo, &row, 1);
	}
	jpeg_finish_compress(&cinfo);
	jpeg_destroy_compress(&cinfo);
	return fclose(file) == 0;
}

/* An opaque photo as RGB, default compression: as cameras and editors
 * write them. */
bool write_png(const std::string &path, const std::vector<uint8_t> &bgra, const Picture &p)
{
	FILE *file = fopen(path.c_str(), "wb");
	if (!file)
		return false;
	png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
	png_infop info = png_create_info_struct(png);
	if (setjmp(png_jmpbuf(png))) {
		png_destroy_write_struct(&png, &info);
		fclose(file);
		return false;
	}
	png_init_io(png, file);
	png_set_IHDR(png, info, png_uint_32(p.w), png_uint_32(p.h), 8, PNG_COLOR_TYPE_RGB, PNG_INTERLACE_NONE,
		     PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
	png_write_info(png, info);
	png_set_bgr(png);
	png_set_filler(png, 0, PNG_FILLER_AFTER);
	for (int y = 0; y < p.h; y++)
		png_write_row(png, &bgra[size_t(y) * p.w * 4]);
	png_write_end(png, info);
	png_destroy_write_struct(&png, &info);
	return fclose(file) == 0;
}

/* Each picture written once per run, on first use. */
const std::string &picture_file(int index)
{
	static std::string paths[std::size(kPictures)];
	std::string &path = paths[index];
	if (path.empty() && !scratch_dir().empty()) {
		const Picture &p = kPictures[index];
		std::string file = scratch_dir() + "/" + p.name + (p.kind == Kind::PNG ? ".png" : ".jpg");
		std::vector<uint8_t> pixels = bench::photo_bgra(p.w, p.h, p.seed);
		if (p.kind == Kind::PNG ? write_png(file, pixels, p) : write_jpeg(file, pixels, p))
			path = file;
	}
	return path;
}

double wall_seconds()
{
	using clock = std::chrono::steady_clock;
	return std::chrono::duration<double>(clock::now().time_since_epoch()).count();
}

double process_seconds()
{
	timespec now;
	clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
	return double(now.tv_sec) + double(now.tv_nsec) * 1e-9;
}

/* The child's processor time in *cpu, or false if it did not run well. */
bool run_vipsthumbnail(const std::string &source, const std::string &output, double *cpu)
{
	std::vector<std::string> env_strings = { "VIPS_CONCURRENCY=1" };
	for (char **e = environ; *e; e++)
		if (strncmp(*e, "VIPS_CONCURRENCY=", 17) != 0)
			env_strings.push_back(*e);
	std::vector<char *> envp;
	for (std::string &s : env_strings)
		envp.push_back(s.data());
	envp.push_back(nullptr);

	std::string size = std::to_string(kThumbnailSize);
	std::string out = output;
	std::string in = source;
	char program[] = "vipsthumbnail";
	char size_flag[] = "--size";
	char out_flag[] = "-o";
	char *argv[] = { program, size_flag, size.data(), out_flag, out.data(), in.data(), nullptr };
	pid_t pid;
	if (posix_spawnp(&pid, program, nullptr, nullptr, argv, envp.data()) != 0)
		return false;
	int status = 0;
	rusage usage = {};
	if (wait4(pid, &status, 0, &usage) != pid || !WIFEXITED(status) || WEXITSTATUS(status) != 0)
		return false;
	auto seconds = [](const timeval &t) { return double(t.tv_sec) + double(t.tv_usec) * 1e-6; };
	*cpu = seconds(usage.ru_utime) + seconds(usage.ru_stime);
	return true;
}

std::string reference_name(int index, bool wall)
{
	return std::string(wall ? "vips_wall_" : "vips_cpu_") + kPictures[index].name;
}

void Vips_Thumbnail(benchmark::State &state, int index)
{
	const std::string &source = picture_file(index);
	if (source.empty()) {
		state.SkipWithError("no source picture");
		return;
	}
	std::string output = scratch_dir() + "/thumbnail.jpg";
	double cpu = 0;
	if (!run_vipsthumbnail(source, output, &cpu)) {
		state.SkipWithError("vipsthumbnail did not run (apt-get install libvips-tools)");
		return;
	}
	double total_wall = 0.0, total_cpu = 0.0;
	for (auto _ : state) {
		double start = wall_seconds();
		bool ok = run_vipsthumbnail(source, output, &cpu);
		double elapsed = wall_seconds() - start;
		if (!ok) {
			state.SkipWithError("vipsthumbnail failed");
			return;
		}
		state.SetIterationTime(elapsed);
		total_wall += elapsed;
		total_cpu += cpu;
	}
	const double n = double(state.iterations());
	state.counters["cpu_ms"] = total_cpu / n * 1e3;
	bench::record_reference(reference_name(index, true), total_wall / n);
	bench::record_reference(reference_name(index, false), total_cpu / n);
}

bool pixels_in_place(Evas_Object *main_image)
{
	int w = 0, h = 0;
	evas_object_image_size_get(ie_image_object_get(main_image), &w, &h);
	return w > 0 && h > 0;
}

void Editor_Open(benchmark::State &state, int index)
{
	const std::string &source = picture_file(index);
	if (source.empty()) {
		state.SkipWithError("no source picture");
		return;
	}
	Evas_Object *win = bench::efl_window(kBoxW, kBoxH);
	static const bool themed = [] {
		elm_theme_extension_add(nullptr, IE_EDJ_FILE);
		return true;
	}();
	(void)themed;
	iel_thread_count_set(int(state.range(0)));
	double total_wall = 0.0, total_cpu = 0.0;
	for (auto _ : state) {
		/* Each open decodes the file, as a first open does. */
		evas_image_cache_flush(evas_object_evas_get(win));

		double start = wall_seconds(), start_cpu = process_seconds();
		Evas_Object *main_image = ie_image_add(win);
		evas_object_resize(main_image, kBoxW, kBoxH);
		Eina_Bool loaded = ie_image_file_load(main_image, source.c_str(), kBoxW, kBoxH);
		/* The completion wakes the loop; the timer only bounds a wait that
		 * would otherwise never end. */
		Ecore_Timer *wake = ecore_timer_add(0.05, [](void *) { return ECORE_CALLBACK_RENEW; }, nullptr);
		double deadline = start + 10.0;
		while (loaded && !pixels_in_place(main_image) && wall_seconds() < deadline)
			ecore_main_loop_iterate_may_block(EINA_TRUE);
		double elapsed = wall_seconds() - start, cpu = process_seconds() - start_cpu;
		ecore_timer_del(wake);

		bool ok = loaded && pixels_in_place(main_image);
		evas_object_del(main_image);
		if (!ok) {
			state.SkipWithError("the picture did not load");
			return;
		}
		state.SetIterationTime(elapsed);
		total_wall += elapsed;
		total_cpu += cpu;
	}
	iel_thread_count_set(0);
	const double n = double(state.iterations());
	state.counters["cpu_ms"] = total_cpu / n * 1e3;
	bench::report_ratio(state, "x_vipsthumbnail", total_cpu / n, reference_name(index, false));
	bench::report_ratio(state, "wall_x_vipsthumbnail", total_wall / n, reference_name(index, true));
}

/* The file decoded at full size, as BGRA. */
cv::Mat full_size_bgra(const std::string &path, const Picture &p)
{
	cv::Mat out(p.h, p.w, CV_8UC4);
	FILE *file = fopen(path.c_str(), "rb");
	if (!file)
		return cv::Mat();
	if (p.kind == Kind::PNG) {
		png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
		png_infop info = png_create_info_struct(png);
		png_init_io(png, file);
		png_read_info(png, info);
		png_set_bgr(png);
		png_set_filler(png, 0xFF, PNG_FILLER_AFTER);
		png_read_update_info(png, info);
		for (int y = 0; y < p.h; y++)
			png_read_row(png, out.ptr(y), nullptr);
		png_destroy_read_struct(&png, &info, nullptr);
	} else {
		jpeg_decompress_struct cinfo;
		jpeg_error_mgr error;
		cinfo.err = jpeg_std_error(&error);
		jpeg_create_decompress(&cinfo);
		jpeg_stdio_src(&cinfo, file);
		jpeg_read_header(&cinfo, TRUE);
		cinfo.out_color_space = JCS_EXT_BGRA;
		jpeg_start_decompress(&cinfo);
		while (cinfo.output_scanline < cinfo.output_height) {
			JSAMPROW row = out.ptr(int(cinfo.output_scanline));
			jpeg_read_scanlines(&cinfo, &row, 1);
		}
		jpeg_finish_decompress(&cinfo);
		jpeg_destroy_decompress(&cinfo);
	}
	fclose(file);
	return out;
}

double psnr_bgr(const cv::Mat &a, const cv::Mat &b)
{
	double sum = 0;
	for (int y = 0; y < a.rows; y++)
		for (int x = 0; x < a.cols; x++)
			for (int c = 0; c < 3; c++) {
				const double d = double(a.at<cv::Vec4b>(y, x)[c]) - double(b.at<cv::Vec4b>(y, x)[c]);
				sum += d * d;
			}
	const double mse = sum / (double(a.rows) * a.cols * 3);
	return mse > 0 ? 10 * std::log10(255.0 * 255.0 / mse) : 99.0;
}

void Editor_Open_Quality(benchmark::State &state, int index)
{
	const std::string &source = picture_file(index);
	if (source.empty()) {
		state.SkipWithError("no source picture");
		return;
	}
	Evas_Object *win = bench::efl_window(kBoxW, kBoxH);
	double psnr = 0;
	for (auto _ : state) {
		evas_image_cache_flush(evas_object_evas_get(win));
		Evas_Object *main_image = ie_image_add(win);
		evas_object_resize(main_image, kBoxW, kBoxH);
		Eina_Bool loaded = ie_image_file_load(main_image, source.c_str(), kBoxW, kBoxH);
		Ecore_Timer *wake = ecore_timer_add(0.05, [](void *) { return ECORE_CALLBACK_RENEW; }, nullptr);
		double deadline = wall_seconds() + 10.0;
		while (loaded && !pixels_in_place(main_image) && wall_seconds() < deadline)
			ecore_main_loop_iterate_may_block(EINA_TRUE);
		ecore_timer_del(wake);
		Evas_Object *image = ie_image_object_get(main_image);
		int w = 0, h = 0;
		evas_object_image_size_get(image, &w, &h);
		const void *pixels = loaded ? evas_object_image_data_get(image, EINA_FALSE) : nullptr;
		cv::Mat full = full_size_bgra(source, kPictures[index]);
		if (!pixels || full.empty()) {
			evas_object_del(main_image);
			state.SkipWithError("the picture did not load");
			return;
		}
		cv::Mat shown(h, w, CV_8UC4, const_cast<void *>(pixels)), reference;
		cv::resize(full, reference, cv::Size(w, h), 0, 0, cv::INTER_AREA);
		psnr = psnr_bgr(shown, reference);
		evas_object_del(main_image);
	}
	state.counters["psnr_db"] = psnr;
}

/* Per picture: the yardstick, then ours. */
const bool registered = [] {
	for (int i = 0; i < int(std::size(kPictures)); i++) {
		const std::string name = kPictures[i].name;
		benchmark::RegisterBenchmark(("Vips_Thumbnail_" + name).c_str(), Vips_Thumbnail, i)
			->UseManualTime()->Unit(benchmark::kMillisecond)->MinTime(2.0);
		benchmark::RegisterBenchmark(("Editor_Open_" + name + "_in_720x1280").c_str(), Editor_Open, i)
			->ArgName("threads")->Arg(1)->Arg(0)->UseManualTime()->Unit(benchmark::kMillisecond)->MinTime(2.0);
		benchmark::RegisterBenchmark(("Editor_Open_Quality_" + name).c_str(), Editor_Open_Quality, i)
			->Iterations(1)->Unit(benchmark::kMillisecond);
	}
	return true;
}();

} // namespace
