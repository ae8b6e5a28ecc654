/* The crop view at 1280x960: one finger moving a corner of the selection
 * box (the event through the canvas, the box's rules, its re-layout on the
 * next calculate), against a memcpy of 4 KiB, with the allocations it
 * makes, and the single Evas call whose cost bounds it; and Done's crop to
 * 640x480 with the picture replaced and refitted, against a memcpy of the
 * cropped bytes, from the picture as the editor's own code leaves it:
 * turned by the rotate view, opened at its own size by the loader, and
 * cropped before. */
#include <gadget_window.h>
#include <unistd.h>

#include <cstring>

#include "bench-common.h"
#include "bench-efl.h"
#include "editor-svc-private.h"
#include "ie-image.h"
#include "ie-selectbox-private.h"

/* Counts the allocations of a measured stretch: every allocation of the
 * process passes here, counted only while `counting` is set. */
extern "C" void *__libc_malloc(size_t size);
extern "C" void *__libc_calloc(size_t count, size_t size);
extern "C" void *__libc_realloc(void *ptr, size_t size);

namespace {
bool counting;
size_t allocations;
} // namespace

extern "C" void *malloc(size_t size)
{
	allocations += counting;
	return __libc_malloc(size);
}

extern "C" void *calloc(size_t count, size_t size)
{
	allocations += counting;
	return __libc_calloc(count, size);
}

extern "C" void *realloc(void *ptr, size_t size)
{
	allocations += counting;
	return __libc_realloc(ptr, size);
}

namespace {

constexpr int kWinW = 720, kWinH = 1280;
constexpr int kCropW = 640, kCropH = 480;

double thread_seconds()
{
	timespec now;
	clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
	return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

/* Runs the main loop, idlers included, until `done` holds (at most 5 s). */
template <class Done>
bool run_until(Done done)
{
	const double deadline = ecore_time_get() + 5.0;
	struct Poll {
		Done *done;
		double deadline;
	} poll = {&done, deadline};
	ecore_timer_add(0.001, [](void *data) -> Eina_Bool {
		auto *p = static_cast<Poll *>(data);
		if ((*p->done)() || ecore_time_get() >= p->deadline) {
			ecore_main_loop_quit();
			return ECORE_CALLBACK_CANCEL;
		}
		return ECORE_CALLBACK_RENEW;
	}, &poll);
	ecore_main_loop_begin();
	return done();
}

/* The scratch folder of the crop benchmarks with the 1280x960 JPEG, made
 * once and removed at exit; the platform services keep their data there
 * unless an earlier benchmark already chose a place. */
const std::string &scratch_picture(Evas *canvas)
{
	static const std::string path = [canvas] {
		std::string dir = std::filesystem::temp_directory_path() / "ie-bench-crop-XXXXXX";
		if (!mkdtemp(dir.data()))
			return std::string();
		static std::string scratch = dir;
		std::atexit([] { std::filesystem::remove_all(scratch); });
		setenv("MEDIA_DB_PATH", (dir + "/media.db").c_str(), 0);
		setenv("VANTRIC_LOG_DB", (dir + "/vantric.db").c_str(), 0);
		std::vector<uint8_t> pixels = bench::photo_bgra();
		Evas_Object *img = evas_object_image_add(canvas);
		evas_object_image_size_set(img, bench::kPhotoWidth, bench::kPhotoHeight);
		evas_object_image_data_copy_set(img, pixels.data());
		evas_object_image_save(img, (dir + "/photo.jpg").c_str(), nullptr, "quality=90");
		evas_object_del(img);
		return dir + "/photo.jpg";
	}();
	return path;
}

/* An editor on the 1280x960 JPEG with the crop view open and its box laid
 * out; destroyed with the benchmark, so that no view stays open for the
 * benchmarks that follow. */
struct Crop_Editor {
	Viewhandle *vh = nullptr;
	Evas *canvas = nullptr;

	Crop_Editor()
	{
		Evas_Object *win = bench::efl_window(kWinW, kWinH);
		ug_set_window(win);
		canvas = evas_object_evas_get(win);
		const std::string &path = scratch_picture(canvas);
		if (path.empty())
			return;
		vh = IE_create(win);
		elm_win_resize_object_add(win, IE_get_view_object(vh));
		IE_setparam(vh, path.c_str(), bench::kPhotoWidth, bench::kPhotoHeight, 0);
		evas_smart_objects_calculate(canvas);
		ie_view_mgr_set_view(IE_VIEW_TYPE_CROP, vh);
		run_until([this] { return vh->selectbox != nullptr; });
		evas_smart_objects_calculate(canvas);
	}
	~Crop_Editor()
	{
		if (vh)
			IE_destroy(vh);
		evas_smart_objects_calculate(canvas);
	}
	bool ready() const { return vh && vh->main_image && vh->selectbox; }

	/* The box's bottom-right corner pressed and dragged by (dx, dy). */
	void drag_corner(int dx, int dy, unsigned int *clock)
	{
		Evas_Coord x, y, w, h;
		ie_selectbox_get_region(vh->selectbox, &x, &y, &w, &h);
		evas_event_feed_mouse_move(canvas, x + w, y + h, *clock += 10, nullptr);
		evas_event_feed_mouse_down(canvas, 1, EVAS_BUTTON_NONE, *clock += 10, nullptr);
		evas_event_feed_mouse_move(canvas, x + w + dx, y + h + dy, *clock += 10, nullptr);
		evas_event_feed_mouse_up(canvas, 1, EVAS_BUTTON_NONE, *clock += 10, nullptr);
		evas_smart_objects_calculate(canvas);
	}
};

void Memcpy_4KiB(benchmark::State &state)
{
	std::vector<uint8_t> src(4096, 0x5a), dst(4096);
	bench::record_reference("memcpy-4k", bench::timed_loop(state, [&] {
		benchmark::DoNotOptimize(src.data());
		memcpy(dst.data(), src.data(), src.size());
		benchmark::ClobberMemory();
	}));
}

/* The box's bottom-right corner held, ready for moves one pixel out and
 * back, so that every move changes the rectangle. */
struct Held_Corner {
	Evas_Coord x, y, w, h;
	unsigned int clock = 1000;

	explicit Held_Corner(Crop_Editor &e)
	{
		ie_selectbox_get_region(e.vh->selectbox, &x, &y, &w, &h);
		evas_event_feed_mouse_move(e.canvas, x + w, y + h, clock += 10, nullptr);
		evas_event_feed_mouse_down(e.canvas, 1, EVAS_BUTTON_NONE, clock += 10, nullptr);
		evas_smart_objects_calculate(e.canvas);
	}
	/* The box still follows the finger. */
	bool followed(Crop_Editor &e) const
	{
		Evas_Coord nw, nh;
		ie_selectbox_get_region(e.vh->selectbox, nullptr, nullptr, &nw, &nh);
		return nw >= w && nh >= h && nw - w <= 1 && nh - h <= 1;
	}
};

void report_event(benchmark::State &state, double seconds)
{
	bench::report_ratio(state, "x_memcpy4k", seconds, "memcpy-4k");
	state.counters["allocs_per_event"] =
		state.iterations() ? static_cast<double>(allocations) / static_cast<double>(state.iterations()) : 0.0;
}

/* The box's own share of a move: its rules for the held corner and its
 * re-layout when it is calculated. The handler is called as the canvas
 * calls it, and only the box is calculated, so that the canvas's dispatch
 * through the editor's widgets and its walk over every smart object of the
 * editor (both measured below) stay out. The canvas calculates with its
 * events frozen, so here too: unfrozen, every member moving under the
 * finger would make Evas look up and feed the pointer again, work the
 * real calculation never does. */
void Selectbox_CornerMove_1280x960(benchmark::State &state)
{
	Crop_Editor e;
	if (!e.ready()) {
		state.SkipWithError("the crop view did not open");
		return;
	}
	Held_Corner corner(e);
	Evas_Event_Mouse_Move ev = {};
	ev.cur.output.x = ev.prev.output.x = corner.x + corner.w;
	ev.cur.output.y = ev.prev.output.y = corner.y + corner.h;
	int step = 0;
	evas_event_freeze(e.canvas);
	allocations = 0;
	counting = true;
	const double seconds = bench::timed_loop(state, [&] {
		const int d = (step++ & 1) ? -1 : 1;
		ev.prev.output = ev.cur.output;
		ev.cur.output.x += d;
		ev.cur.output.y += d;
		_on_mouse_move(e.vh->selectbox, e.canvas, nullptr, &ev);
		evas_object_smart_calculate(e.vh->selectbox);
	});
	counting = false;
	evas_event_thaw(e.canvas);
	if (!corner.followed(e)) {
		state.SkipWithError("the box did not follow the finger");
		return;
	}
	report_event(state, seconds);
}

/* What bounds the box's share of a move: one Evas geometry call, a
 * rectangle on the same canvas moved by a pixel with events frozen, as the
 * box's members are moved when the canvas calculates. A corner move makes
 * fourteen of them (four lines, five handles moved, two bands moved and
 * resized, one resized), however little the box's own code does around
 * them. */
void Evas_RectangleMove(benchmark::State &state)
{
	Evas *canvas = evas_object_evas_get(bench::efl_window(kWinW, kWinH));
	Evas_Object *rect = evas_object_rectangle_add(canvas);
	evas_object_resize(rect, 18, 18);
	evas_object_show(rect);
	int step = 0;
	evas_event_freeze(canvas);
	const double seconds = bench::timed_loop(state, [&] { evas_object_move(rect, 100 + (step++ & 1), 100); });
	evas_event_thaw(canvas);
	evas_object_del(rect);
	bench::report_ratio(state, "x_memcpy4k", seconds, "memcpy-4k");
}

/* The same move as a mouse event fed to the canvas: the hit test and every
 * object under the finger (the box, the picture's gesture layer, the
 * widgets around it) take their part. */
void Selectbox_CornerMoveEvent_1280x960(benchmark::State &state)
{
	Crop_Editor e;
	if (!e.ready()) {
		state.SkipWithError("the crop view did not open");
		return;
	}
	Held_Corner corner(e);
	const int px = corner.x + corner.w, py = corner.y + corner.h;
	int step = 0;
	allocations = 0;
	counting = true;
	const double seconds = bench::timed_loop(state, [&] {
		const int d = (step++ & 1) ? 0 : 1;
		evas_event_feed_mouse_move(e.canvas, px + d, py + d, corner.clock += 10, nullptr);
		evas_smart_objects_calculate(e.canvas);
	});
	counting = false;
	evas_event_feed_mouse_up(e.canvas, 1, EVAS_BUTTON_NONE, corner.clock += 10, nullptr);
	if (!corner.followed(e)) {
		state.SkipWithError("the box did not follow the finger");
		return;
	}
	report_event(state, seconds);
}

void Memcpy_Crop_640x480(benchmark::State &state)
{
	const size_t bytes = static_cast<size_t>(kCropW) * kCropH * 4;
	std::vector<uint8_t> src = bench::photo_bgra(kCropW, kCropH), dst(bytes);
	bench::record_reference("memcpy-cropped", bench::timed_loop(state, [&] {
		memcpy(dst.data(), src.data(), bytes);
		benchmark::ClobberMemory();
	}));
}

/* Done's crop of the 1280x960 picture to 640x480, each round with the whole
 * picture put back first by `restore`, which is given the editor and the
 * picture's pixels, and then drawn (both untimed): Done comes to a picture
 * that was on screen, not to one whose bytes were just written and still
 * lie in the processor's caches. The box covers 640x480 picture pixels of
 * the picture shown 720 wide. */
template <class Restore>
void done_crop_rounds(benchmark::State &state, Restore restore)
{
	Crop_Editor e;
	if (!e.ready()) {
		state.SkipWithError("the crop view did not open");
		return;
	}
	unsigned int clock = 1000;
	Evas_Coord w, h;
	ie_selectbox_get_region(e.vh->selectbox, nullptr, nullptr, &w, &h);
	Evas_Coord dw, dh;
	ie_image_geometry_get(e.vh->main_image, nullptr, nullptr, &dw, &dh);
	e.drag_corner(kCropW * dw / bench::kPhotoWidth - w, kCropH * dh / bench::kPhotoHeight - h, &clock);

	Evas_Object *img = ie_image_object_get(e.vh->main_image);
	const size_t bytes = static_cast<size_t>(bench::kPhotoWidth) * bench::kPhotoHeight * 4;
	std::vector<uint8_t> whole(bytes);
	memcpy(whole.data(), evas_object_image_data_get(img, EINA_FALSE), bytes);

	double total = 0;
	for (auto _ : state) {
		state.PauseTiming();
		restore(e.vh, whole);
		ie_image_size_update(e.vh->main_image);
		evas_smart_objects_calculate(e.canvas);
		evas_render_updates_free(evas_render_updates(e.canvas));
		state.ResumeTiming();

		const double start = thread_seconds();
		__apply_crop(e.vh);
		ie_image_size_update(e.vh->main_image);
		evas_smart_objects_calculate(e.canvas);
		total += thread_seconds() - start;

		int cw = 0, ch = 0;
		evas_object_image_size_get(img, &cw, &ch);
		if (cw != kCropW || ch != kCropH) {
			state.SkipWithError("the crop did not give 640x480");
			return;
		}
	}
	if (state.iterations())
		bench::report_ratio(state, "x_memcpy", total / static_cast<double>(state.iterations()), "memcpy-cropped");
}

/* Puts the whole picture back in the editor's own buffer. */
void take_whole(Viewhandle *vh, const std::vector<uint8_t> &whole)
{
	void *pixels = malloc(whole.size());
	if (pixels)
		memcpy(pixels, whole.data(), whole.size());
	ie_image_pixels_take(vh->main_image, pixels, bench::kPhotoWidth, bench::kPhotoHeight);
}

/* The picture as the rotate view leaves it: turned right and back left by
 * its own code. */
void Editor_DoneCropAfterTurn_1280x960_To_640x480(benchmark::State &state)
{
	done_crop_rounds(state, [](Viewhandle *vh, const std::vector<uint8_t> &whole) {
		take_whole(vh, whole);
		ie_create_rotate_view(vh, 1);
		ie_create_rotate_view(vh, 3);
	});
}

/* The picture as the loader leaves it when the box holds it at its own
 * size (a second load call lets the earlier picture go, the next one
 * loads). */
void Editor_DoneCropOpenedAtOwnSize_1280x960_To_640x480(benchmark::State &state)
{
	done_crop_rounds(state, [](Viewhandle *vh, const std::vector<uint8_t> &) {
		const std::string &path = scratch_picture(evas_object_evas_get(vh->main_image));
		ie_image_file_load(vh->main_image, path.c_str(), bench::kPhotoWidth, bench::kPhotoHeight);
		ie_image_file_load(vh->main_image, path.c_str(), bench::kPhotoWidth, bench::kPhotoHeight);
	});
}

/* The picture in the editor's own buffer after an earlier crop: the crop
 * happens where the picture lies. */
void Editor_DoneCropAgain_1280x960_To_640x480(benchmark::State &state)
{
	done_crop_rounds(state, take_whole);
}

} // namespace

BENCHMARK(Memcpy_4KiB);
BENCHMARK(Evas_RectangleMove);
BENCHMARK(Selectbox_CornerMove_1280x960);
BENCHMARK(Selectbox_CornerMoveEvent_1280x960);
BENCHMARK(Memcpy_Crop_640x480)->Unit(benchmark::kMicrosecond);
BENCHMARK(Editor_DoneCropAfterTurn_1280x960_To_640x480)->Unit(benchmark::kMicrosecond);
BENCHMARK(Editor_DoneCropOpenedAtOwnSize_1280x960_To_640x480)->Unit(benchmark::kMicrosecond);
BENCHMARK(Editor_DoneCropAgain_1280x960_To_640x480)->Unit(benchmark::kMicrosecond);
