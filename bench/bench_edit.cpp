/* What a user waits for in the editor at 1280x960: a rotate tap (engine,
 * pixel replacement and refit) and Done (JPEG encode, flush, publish and
 * media-database registration), each against a memcpy of the picture. */
#include <gadget_window.h>
#include <unistd.h>

#include <chrono>
#include <cstring>

#include "bench-common.h"
#include "bench-efl.h"
#include "editor-svc-private.h"
#include "ie-image.h"
#include "ie-save.h"

namespace {

constexpr int kWinW = 720, kWinH = 1280;

struct Editor_Fixture {
	Viewhandle *vh = nullptr;
	std::string dir;
};

/* An editor opened on a 1280x960 JPEG in a scratch folder, once per run. */
Editor_Fixture &editor()
{
	static Editor_Fixture fixture = [] {
		Editor_Fixture f;
		Evas_Object *win = bench::efl_window(kWinW, kWinH);
		ug_set_window(win);
		f.dir = std::filesystem::temp_directory_path() / "ie-bench-edit-XXXXXX";
		if (!mkdtemp(f.dir.data()))
			return f;
		static std::string scratch = f.dir;
		std::atexit([] { std::filesystem::remove_all(scratch); });
		setenv("MEDIA_DB_PATH", (f.dir + "/media.db").c_str(), 1);
		setenv("VANTRIC_LOG_DB", (f.dir + "/vantric.db").c_str(), 1);
		setenv("STORAGE_INTERNAL_ROOT", f.dir.c_str(), 1);

		std::string path = f.dir + "/photo.jpg";
		std::vector<uint8_t> pixels = bench::photo_bgra();
		Evas_Object *img = evas_object_image_add(evas_object_evas_get(win));
		evas_object_image_size_set(img, bench::kPhotoWidth, bench::kPhotoHeight);
		evas_object_image_data_copy_set(img, pixels.data());
		evas_object_image_save(img, path.c_str(), nullptr, "quality=90");
		evas_object_del(img);

		f.vh = IE_create(win);
		elm_win_resize_object_add(win, IE_get_view_object(f.vh));
		IE_setparam(f.vh, path.c_str(), bench::kPhotoWidth, bench::kPhotoHeight, 0);
		evas_smart_objects_calculate(evas_object_evas_get(win));
		return f;
	}();
	return fixture;
}

void Memcpy_Edit_1280x960(benchmark::State &state)
{
	std::vector<uint8_t> src = bench::photo_bgra(), dst(src.size());
	bench::record_reference("memcpy-edit", bench::timed_loop(state, [&] {
		memcpy(dst.data(), src.data(), src.size());
		benchmark::ClobberMemory();
	}));
}

void Editor_RotateTap_1280x960(benchmark::State &state)
{
	Editor_Fixture &f = editor();
	if (!f.vh || !f.vh->main_image) {
		state.SkipWithError("the editor could not open the picture");
		return;
	}
	Evas *canvas = evas_object_evas_get(IE_get_view_object(f.vh));
	double seconds = bench::timed_loop(state, [&] {
		ie_create_rotate_view(f.vh, 1);
		evas_smart_objects_calculate(canvas);
	});
	bench::report_ratio(state, "x_memcpy", seconds, "memcpy-edit");
}

void Editor_Done_1280x960(benchmark::State &state)
{
	Editor_Fixture &f = editor();
	if (!f.vh || !f.vh->main_image) {
		state.SkipWithError("the editor could not open the picture");
		return;
	}
	Evas_Object *inner = ie_image_object_get(f.vh->main_image);
	const std::string source = f.dir + "/photo.jpg";
	double total = 0;
	for (auto _ : state) {
		_save_init(source.c_str());
		auto start = std::chrono::steady_clock::now();
		Eina_Bool memory_full = EINA_FALSE;
		char *saved = _save_to_file(inner, &memory_full);
		total += std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
		state.PauseTiming();
		if (!saved) {
			state.SkipWithError("the save failed");
			break;
		}
		unlink(saved);
		free(saved);
		state.ResumeTiming();
	}
	if (state.iterations())
		bench::report_ratio(state, "x_memcpy", total / state.iterations(), "memcpy-edit");
}

} // namespace

BENCHMARK(Memcpy_Edit_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Editor_RotateTap_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Editor_Done_1280x960)->Unit(benchmark::kMillisecond);
