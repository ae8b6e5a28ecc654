/* Opening a 4000x3000 JPEG in a 720x1280 box, as IE_setparam does it: from
 * creating the main image to the reduced picture's pixels in place (the
 * background decode at reduced size and the offscreen render included).
 * The yardstick is Debian's vipsthumbnail making a 1280-pixel version of
 * the same file on one thread, run as the command a user would type.
 * Both are wall times: the decode runs off the main loop, and the
 * yardstick is another process. */
#include <Ecore_Evas.h>
#include <Elementary.h>

#include <spawn.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

#include "bench-common.h"
#include "bench-efl.h"
#include "ie-image.h"

extern char **environ;

namespace {

constexpr int kBoxW = 720;
constexpr int kBoxH = 1280;
constexpr int kSourceW = 4000;
constexpr int kSourceH = 3000;
constexpr int kThumbnailSize = 1280;
constexpr const char *kVipsReference = "vipsthumbnail_4000x3000_to_1280";

/* A photo-like 4000x3000 JPEG, written once per run. */
const std::string &source_jpeg()
{
	static const std::string path = [] {
		std::string dir = std::filesystem::temp_directory_path() / "ie-bench-load-XXXXXX";
		if (!mkdtemp(dir.data()))
			return std::string();
		static std::string scratch = dir;
		std::atexit([] { std::filesystem::remove_all(scratch); });
		std::string file = dir + "/photo.jpg";
		std::vector<uint8_t> pixels = bench::photo_bgra(kSourceW, kSourceH, 2024);
		Evas_Object *img = evas_object_image_add(evas_object_evas_get(bench::efl_window(kBoxW, kBoxH)));
		evas_object_image_alpha_set(img, EINA_FALSE);
		evas_object_image_size_set(img, kSourceW, kSourceH);
		evas_object_image_data_copy_set(img, pixels.data());
		bool saved = evas_object_image_save(img, file.c_str(), nullptr, "quality=90");
		evas_object_del(img);
		return saved ? file : std::string();
	}();
	return path;
}

double wall_seconds()
{
	using clock = std::chrono::steady_clock;
	return std::chrono::duration<double>(clock::now().time_since_epoch()).count();
}

bool run_vipsthumbnail(const std::string &source, const std::string &output)
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
	return waitpid(pid, &status, 0) == pid && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

void Vips_Thumbnail_4000x3000_to_1280(benchmark::State &state)
{
	const std::string &source = source_jpeg();
	if (source.empty()) {
		state.SkipWithError("no source picture");
		return;
	}
	std::string output = std::filesystem::path(source).parent_path() / "thumbnail.jpg";
	if (!run_vipsthumbnail(source, output)) {
		state.SkipWithError("vipsthumbnail did not run (apt-get install libvips-tools)");
		return;
	}
	double total = 0.0;
	for (auto _ : state) {
		double start = wall_seconds();
		bool ok = run_vipsthumbnail(source, output);
		double elapsed = wall_seconds() - start;
		if (!ok) {
			state.SkipWithError("vipsthumbnail failed");
			return;
		}
		state.SetIterationTime(elapsed);
		total += elapsed;
	}
	bench::record_reference(kVipsReference, total / state.iterations());
}

bool pixels_in_place(Evas_Object *main_image)
{
	int w = 0, h = 0;
	evas_object_image_size_get(ie_image_object_get(main_image), &w, &h);
	return w > 0 && h > 0;
}

void Editor_Open_4000x3000_in_720x1280(benchmark::State &state)
{
	const std::string &source = source_jpeg();
	if (source.empty()) {
		state.SkipWithError("no source picture");
		return;
	}
	Evas_Object *win = bench::efl_window(kBoxW, kBoxH);
	double total = 0.0;
	for (auto _ : state) {
		/* Each open decodes the file, as a first open does. */
		evas_image_cache_flush(evas_object_evas_get(win));

		double start = wall_seconds();
		Evas_Object *main_image = ie_image_add(win);
		evas_object_resize(main_image, kBoxW, kBoxH);
		Eina_Bool loaded = ie_image_file_load(main_image, source.c_str(), kBoxW, kBoxH);
		/* The completion wakes the loop; the timer only bounds a wait that
		 * would otherwise never end. */
		Ecore_Timer *wake = ecore_timer_add(0.05, [](void *) { return ECORE_CALLBACK_RENEW; }, nullptr);
		double deadline = start + 10.0;
		while (loaded && !pixels_in_place(main_image) && wall_seconds() < deadline)
			ecore_main_loop_iterate_may_block(EINA_TRUE);
		double elapsed = wall_seconds() - start;
		ecore_timer_del(wake);

		bool ok = loaded && pixels_in_place(main_image);
		evas_object_del(main_image);
		if (!ok) {
			state.SkipWithError("the picture did not load");
			return;
		}
		state.SetIterationTime(elapsed);
		total += elapsed;
	}
	bench::report_ratio(state, "x_vipsthumbnail", total / state.iterations(), kVipsReference);
}

} // namespace

BENCHMARK(Vips_Thumbnail_4000x3000_to_1280)->UseManualTime()->Unit(benchmark::kMillisecond)->MinTime(2.0);
BENCHMARK(Editor_Open_4000x3000_in_720x1280)->UseManualTime()->Unit(benchmark::kMillisecond)->MinTime(2.0);
