/* What a user waits for in the editor at 1280x960: a rotate tap (engine,
 * pixel replacement and refit) and Done (JPEG encode, flush, publish and
 * media-database registration, the last off the main loop but timed here
 * in line), each against a memcpy of the picture; Done also from a
 * photograph whose EXIF block and colour profile go into the saved file. */
#include <gadget_window.h>
#include <libexif/exif-data.h>
#include <media_db.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <fstream>
#include <iterator>

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

std::string read_file(const std::string &path)
{
	std::ifstream in(path, std::ios::binary);
	return {std::istreambuf_iterator<char>(in), {}};
}

std::string segment(int marker, const std::string &data)
{
	size_t length = data.size() + 2;
	return std::string{'\xFF', static_cast<char>(marker), static_cast<char>(length >> 8),
			   static_cast<char>(length & 0xFF)} +
	       data;
}

void add_text(ExifData *exif, ExifIfd ifd, ExifTag tag, const char *text)
{
	ExifEntry *entry = exif_entry_new();
	entry->tag = tag;
	entry->format = EXIF_FORMAT_ASCII;
	entry->components = strlen(text) + 1;
	entry->size = static_cast<unsigned int>(entry->components);
	entry->data = static_cast<unsigned char *>(malloc(entry->size));
	memcpy(entry->data, text, entry->size);
	exif_content_add_entry(exif->ifd[ifd], entry);
	exif_entry_unref(entry);
}

/* `jpeg` as a camera writes it: an EXIF block with a date, make, model,
 * orientation and an 8 KiB thumbnail, and a 3 KiB colour profile. */
void write_camera_copy(const std::string &jpeg, const std::string &path)
{
	ExifData *exif = exif_data_new();
	exif_data_set_byte_order(exif, EXIF_BYTE_ORDER_INTEL);
	add_text(exif, EXIF_IFD_0, EXIF_TAG_MAKE, "Testcam");
	add_text(exif, EXIF_IFD_0, EXIF_TAG_MODEL, "T-100");
	add_text(exif, EXIF_IFD_EXIF, EXIF_TAG_DATE_TIME_ORIGINAL, "2021:07:14 09:30:05");
	ExifEntry *orientation = exif_entry_new();
	exif_content_add_entry(exif->ifd[EXIF_IFD_0], orientation);
	exif_entry_initialize(orientation, EXIF_TAG_ORIENTATION);
	exif_entry_unref(orientation);
	exif->size = 8192;
	exif->data = static_cast<unsigned char *>(calloc(1, exif->size));
	unsigned char *block = nullptr;
	unsigned int block_len = 0;
	exif_data_save_data(exif, &block, &block_len);
	std::string header = segment(0xE1, std::string(reinterpret_cast<char *>(block), block_len)) +
			     segment(0xE2, std::string("ICC_PROFILE\0\x01\x01", 14) + std::string(3144, 'p'));
	free(block);
	exif_data_unref(exif);
	std::ofstream(path, std::ios::binary) << jpeg.substr(0, 2) << header << jpeg.substr(2);
}

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
		write_camera_copy(read_file(path), f.dir + "/camera.jpg");

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

/* Done from `source` (the pixels are the same picture either way). */
void time_done(benchmark::State &state, const char *source_name)
{
	Editor_Fixture &f = editor();
	if (!f.vh || !f.vh->main_image) {
		state.SkipWithError("the editor could not open the picture");
		return;
	}
	Evas_Object *inner = ie_image_object_get(f.vh->main_image);
	const std::string source = f.dir + "/" + source_name;
	double total = 0;
	for (auto _ : state) {
		_save_init(source.c_str());
		auto start = std::chrono::steady_clock::now();
		Eina_Bool memory_full = EINA_FALSE;
		char *saved = _save_to_file(inner, &memory_full);
		int registered = saved ? media_content_scan_file(saved) : MEDIA_DB_ERROR_INVALID_PARAMETER;
		total += std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
		state.PauseTiming();
		if (!saved || registered != MEDIA_DB_ERROR_NONE) {
			state.SkipWithError("the save failed");
			free(saved);
			break;
		}
		unlink(saved);
		free(saved);
		state.ResumeTiming();
	}
	if (state.iterations())
		bench::report_ratio(state, "x_memcpy", total / state.iterations(), "memcpy-edit");
}

void Editor_Done_1280x960(benchmark::State &state)
{
	time_done(state, "photo.jpg");
}

void Editor_DoneWithMetadata_1280x960(benchmark::State &state)
{
	time_done(state, "camera.jpg");
}

} // namespace

BENCHMARK(Memcpy_Edit_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Editor_RotateTap_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Editor_Done_1280x960)->Unit(benchmark::kMillisecond);
BENCHMARK(Editor_DoneWithMetadata_1280x960)->Unit(benchmark::kMillisecond);
