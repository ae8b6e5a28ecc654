/* The effect view on a picture shown at 1280 x 960, single thread:
 * - a tap (generateEffect: the effect, the copy into the picture, the kept
 *   result) per catalogue row, against cv::transform 4x4 on the same
 *   picture (x_transform; tone effects at most 1.5, every effect within
 *   50 ms);
 * - one re-blend of the drag (generateEffectAlpha) against cv::addWeighted
 *   (x_addweighted, at most 1.0);
 * - opening the view: SetThumbnailBuffer and the twenty thumbnails, within
 *   16 ms, also against one cv::resize of the picture to 157 x 118
 *   (x_resize). */
#include <gadget_window.h>
#include <unistd.h>

#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>

#include <cstring>
#include <filesystem>

#include "bench-common.h"
#include "bench-efl.h"
#include "editor-svc-private.h"
#include "ie-engine.h"

namespace {

constexpr int kWinW = 720, kWinH = 1280;
constexpr const char *kTransform = "view-transform4x4";
constexpr const char *kAddWeighted = "view-addweighted";
constexpr const char *kResize = "view-resize-157x118";

/* An editor with the effect view open on a 1280x960 JPEG, once per run. */
Viewhandle *effect_view()
{
	static Viewhandle *vh = [] {
		Evas_Object *win = bench::efl_window(kWinW, kWinH);
		ug_set_window(win);
		std::string dir = std::filesystem::temp_directory_path() / "ie-bench-effect-view-XXXXXX";
		if (!mkdtemp(dir.data()))
			return static_cast<Viewhandle *>(nullptr);
		std::string path = dir + "/photo.jpg";
		std::vector<uint8_t> pixels = bench::photo_bgra();
		Evas_Object *img = evas_object_image_add(evas_object_evas_get(win));
		evas_object_image_size_set(img, bench::kPhotoWidth, bench::kPhotoHeight);
		evas_object_image_data_copy_set(img, pixels.data());
		evas_object_image_save(img, path.c_str(), nullptr, "quality=90");
		evas_object_del(img);

		Viewhandle *editor = IE_create(win);
		elm_win_resize_object_add(win, IE_get_view_object(editor));
		IE_setparam(editor, path.c_str(), bench::kPhotoWidth, bench::kPhotoHeight, 0);
		std::filesystem::remove_all(dir);
		if (!editor->main_image)
			return static_cast<Viewhandle *>(nullptr);
		ie_view_mgr_set_view(IE_VIEW_TYPE_EFFECT, editor);
		evas_smart_objects_calculate(evas_object_evas_get(win));
		bool ready = editor->orig_buf && editor->image_width == bench::kPhotoWidth &&
			     editor->image_height == bench::kPhotoHeight;
		return ready ? editor : static_cast<Viewhandle *>(nullptr);
	}();
	return vh;
}

cv::Mat picture_mat(Viewhandle *vh)
{
	return cv::Mat(vh->image_height, vh->image_width, CV_8UC4, vh->orig_buf);
}

void BM_EffectView_CvTransform4x4(benchmark::State &state)
{
	Viewhandle *vh = effect_view();
	if (!vh) {
		state.SkipWithError("the effect view could not open");
		return;
	}
	cv::setNumThreads(1);
	cv::Mat src = picture_mat(vh), dst(src.size(), src.type());
	const cv::Matx44f sepia(0.272f, 0.534f, 0.131f, 0.f, 0.349f, 0.686f, 0.168f, 0.f, 0.393f, 0.769f, 0.189f, 0.f,
				0.f, 0.f, 0.f, 1.f);
	bench::record_reference(kTransform, bench::timed_loop(state, [&] {
		cv::transform(src, dst, sepia);
		benchmark::DoNotOptimize(dst.data);
	}));
}

void BM_EffectView_CvAddWeighted(benchmark::State &state)
{
	Viewhandle *vh = effect_view();
	if (!vh) {
		state.SkipWithError("the effect view could not open");
		return;
	}
	cv::setNumThreads(1);
	cv::Mat src = picture_mat(vh), effect, dst(src.size(), src.type());
	cv::bitwise_not(src, effect);
	bench::record_reference(kAddWeighted, bench::timed_loop(state, [&] {
		cv::addWeighted(effect, 0.7, src, 0.3, 0.0, dst);
		benchmark::DoNotOptimize(dst.data);
	}));
}

void BM_EffectView_CvResizeToThumbnail(benchmark::State &state)
{
	Viewhandle *vh = effect_view();
	if (!vh) {
		state.SkipWithError("the effect view could not open");
		return;
	}
	cv::setNumThreads(1);
	cv::Mat src = picture_mat(vh), dst;
	bench::record_reference(kResize, bench::timed_loop(state, [&] {
		cv::resize(src, dst, cv::Size(157, 118), 0, 0, cv::INTER_LINEAR);
		benchmark::DoNotOptimize(dst.data);
	}));
}

/* One effect tap, as the idler runs it after the tap. */
void BM_EffectView_Tap(benchmark::State &state, int row)
{
	Viewhandle *vh = effect_view();
	if (!vh) {
		state.SkipWithError("the effect view could not open");
		return;
	}
	bool failed = false;
	double seconds = bench::timed_loop(state, [&] {
		failed |= !generateEffect(vh, row);
		edje_message_signal_process();
	});
	if (failed)
		state.SkipWithError("the effect failed");
	state.counters["ms"] = seconds * 1e3;
	bench::report_ratio(state, "x_transform", seconds, kTransform);
}

/* One re-blend of the drag: alternate values, so that none is skipped. */
void BM_EffectView_Blend(benchmark::State &state)
{
	Viewhandle *vh = effect_view();
	if (!vh || !generateEffect(vh, 15)) {
		state.SkipWithError("the effect view could not open");
		return;
	}
	float alpha = 40.0f;
	double seconds = bench::timed_loop(state, [&] {
		alpha = alpha == 40.0f ? 60.0f : 40.0f;
		generateEffectAlpha(vh, alpha);
	});
	bench::report_ratio(state, "x_addweighted", seconds, kAddWeighted);
}

/* The copies made when the view opens and the twenty thumbnails the grid
 * asks for. */
void BM_EffectView_Open(benchmark::State &state)
{
	Viewhandle *vh = effect_view();
	if (!vh || !vh->effect_itc) {
		state.SkipWithError("the effect view could not open");
		return;
	}
	int missing = 0;
	double seconds = bench::timed_loop(state, [&] {
		SetThumbnailBuffer(vh);
		Eina_List *node;
		void *item;
		EINA_LIST_FOREACH(vh->effect_items, node, item) {
			Evas_Object *thumb = vh->effect_itc->func.content_get(item, vh->effect_grid, "elm.swallow.icon");
			missing += !thumb;
			evas_object_del(thumb);
		}
	});
	if (missing || eina_list_count(vh->effect_items) != 20)
		state.SkipWithError("a thumbnail failed");
	state.counters["ms"] = seconds * 1e3;
	bench::report_ratio(state, "x_resize", seconds, kResize);
}

struct Tap_Row {
	const char *name;
	int row;
};
constexpr Tap_Row kTapRows[] = {
	{"Vintage", 1}, {"Sunshine", 2}, {"Nostalgia", 3}, {"YellowGlow", 4}, {"Blur", 5},
	{"SoftGlow", 6}, {"OldPhoto", 7}, {"Retro", 8}, {"Greyscale", 9}, {"Sepia", 10},
	{"FadedColours", 11}, {"Downlight", 12}, {"Sharpen", 13}, {"Sketch", 14}, {"Negative", 15},
	{"OilPaint", 16}, {"Posterise", 17}, {"Cartoon", 18}, {"PopArt", 19}, {"MagicPen", 20},
};

/* Yardsticks first, then ours. */
int register_benchmarks()
{
	benchmark::RegisterBenchmark("EffectView_CvTransform4x4_1280x960", BM_EffectView_CvTransform4x4)
		->Unit(benchmark::kMillisecond);
	benchmark::RegisterBenchmark("EffectView_CvAddWeighted_1280x960", BM_EffectView_CvAddWeighted)
		->Unit(benchmark::kMillisecond);
	benchmark::RegisterBenchmark("EffectView_CvResize_1280x960_to_157x118", BM_EffectView_CvResizeToThumbnail)
		->Unit(benchmark::kMillisecond);
	for (const Tap_Row &tap : kTapRows)
		benchmark::RegisterBenchmark((std::string("EffectView_Tap_") + tap.name + "_1280x960").c_str(),
					     BM_EffectView_Tap, tap.row)
			->Unit(benchmark::kMillisecond);
	benchmark::RegisterBenchmark("EffectView_Blend_1280x960", BM_EffectView_Blend)->Unit(benchmark::kMillisecond);
	benchmark::RegisterBenchmark("EffectView_Open_1280x960", BM_EffectView_Open)->Unit(benchmark::kMillisecond);
	return 0;
}

const int registered = register_benchmarks();

} // namespace
