/* Picture loading with real files: as is, resampled at once, or decoded in
 * the background behind the processing popup; EXIF orientation; and the
 * files that cannot be loaded. */
#include <algorithm>
#include <climits>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <vector>

#include "image_test_fixture.h"

namespace iet {
namespace {

/* Files Evas cannot save: GIF, and JPEG with an EXIF orientation. */
using Bytes = std::vector<uint8_t>;

bool write_bytes(const std::string &path, const Bytes &bytes)
{
	std::ofstream out(path, std::ios::binary);
	return bool(out.write(reinterpret_cast<const char *>(bytes.data()), (std::streamsize)bytes.size()));
}

bool write_flat_gif(const std::string &path, int w, int h, uint32_t rgb)
{
	auto lo = [](int v) { return uint8_t(v); };
	auto hi = [](int v) { return uint8_t(v >> 8); };
	Bytes b = { 'G', 'I', 'F', '8', '9', 'a', lo(w), hi(w), lo(h), hi(h), 0x91, 0, 0, /* 4 colours */
		    uint8_t(rgb >> 16), uint8_t(rgb >> 8), uint8_t(rgb), 0, 0, 0, 0, 0, 0, 0, 0, 0,
		    0x2c, 0, 0, 0, 0, lo(w), hi(w), lo(h), hi(h), 0, 2 /* no local table, 2-bit LZW */ };
	/* Uncompressed LZW: a clear code (4) before every second pixel keeps
	 * the codes 3 bits wide; 5 ends the data. */
	Bytes data;
	uint32_t bits = 0;
	int count = 0;
	auto emit = [&](uint32_t code) {
		bits |= code << count;
		for (count += 3; count >= 8; count -= 8, bits >>= 8)
			data.push_back(bits & 0xff);
	};
	for (size_t i = 0; i < (size_t)w * h; i++) {
		if (i % 2 == 0)
			emit(4);
		emit(0);
	}
	emit(5);
	if (count > 0)
		data.push_back(bits & 0xff);
	for (size_t at = 0; at < data.size(); at += 255) {
		size_t n = std::min<size_t>(255, data.size() - at);
		b.push_back((uint8_t)n);
		b.insert(b.end(), data.begin() + at, data.begin() + at + n);
	}
	b.insert(b.end(), { 0, 0x3b });
	return write_bytes(path, b);
}

bool add_exif_orientation(const std::string &jpeg_path, int orientation)
{
	std::ifstream in(jpeg_path, std::ios::binary);
	Bytes jpeg((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
	if (jpeg.size() < 2 || jpeg[0] != 0xff || jpeg[1] != 0xd8)
		return false;
	/* APP1 of 34 bytes: "Exif", then a little-endian TIFF with one IFD
	 * entry, the orientation. */
	Bytes app1 = { 0xff, 0xe1, 0, 34, 'E', 'x', 'i', 'f', 0, 0, 'I', 'I', 0x2a, 0, 8, 0, 0, 0, 1, 0,
		       0x12, 0x01, 3, 0, 1, 0, 0, 0, uint8_t(orientation), 0, 0, 0, 0, 0, 0, 0 };
	jpeg.insert(jpeg.begin() + 2, app1.begin(), app1.end());
	return write_bytes(jpeg_path, jpeg);
}

void truncate_file(const std::string &path, double fraction)
{
	std::filesystem::resize_file(path, (uintmax_t)(std::filesystem::file_size(path) * fraction));
}

constexpr uint32_t MARK = 0xffffff;

void count_call(void *data, Evas_Object *, void *) { ++*static_cast<int *>(data); }
void count_del(void *data, Evas *, Evas_Object *, void *) { ++*static_cast<int *>(data); }

class MainImageLoad : public MainImageTest {
protected:
	void SetUp() override
	{
		MainImageTest::SetUp();
		/* The theme may not be built in this tree; the popup survives it. */
		allow_efl_error("processing_view_layout");
	}

	/* Into a new object, with nothing cached: background loads must not
	 * find the picture decoded already. */
	Eina_Bool load(const std::string &path, int box_w = 720, int box_h = 1280)
	{
		add_image();
		evas_image_cache_flush(evas());
		return ie_image_file_load(obj_, path.c_str(), box_w, box_h);
	}

	bool wait_for_pixels()
	{
		return run_until([this] { return pixel_size().w > 0 && !sd()->processing_popup; });
	}

	/* JPEG and resampling blur colours a little. */
	void expect_colour(int x, int y, uint32_t rgb, int tolerance = 28)
	{
		auto *pixels = static_cast<const uint32_t *>(ie_image_data_get(obj_));
		ASSERT_TRUE(pixels && x < pixel_size().w && y < pixel_size().h) << "no pixel at " << x << ", " << y;
		uint32_t p = pixels[(size_t)y * pixel_size().w + x];
		for (int shift : { 16, 8, 0 })
			EXPECT_NEAR(int(p >> shift & 0xff), int(rgb >> shift & 0xff), tolerance) << x << ", " << y;
	}

	/* write_picture's gradient, upright and in its own colours: the mark at
	 * the top left, red at the top right. */
	void expect_upright()
	{
		expect_colour(1, 1, MARK);
		expect_colour(pixel_size().w - 1, 0, 0xff0060);
	}

	int load_errors() const
	{
		std::vector<std::string> lines = log_messages();
		return (int)std::count_if(lines.begin(), lines.end(), [](const std::string &line) {
			return line.rfind("could not load image. error string is \"", 0) == 0;
		});
	}
};

TEST_F(MainImageLoad, ReducesToTheBoxAtOnceOrBehindThePopup)
{
	std::string gif = scratch_path("flat.gif");
	ASSERT_TRUE(write_flat_gif(gif, 1500, 1000, 0xc83214));
	auto turned = [this](int w, int h, int orientation) {
		std::string path = picture("turned-" + std::to_string(w) + "-" + std::to_string(orientation) + ".jpg", w, h);
		EXPECT_TRUE(add_exif_orientation(path, orientation));
		return path;
	};
	struct Case {
		std::string path;
		int w, h;
		int scale_down; /* of the background load; -1 for at once */
		int orientation;
	} cases[] = {
		{ picture("small.jpg", 640, 480), 640, 480, -1, 1 },
		{ picture("double.jpg", 2000, 1500), 1280, 960, -1, 1 },
		{ picture("triple.jpg", 3000, 2000), 1280, 853, -1, 1 },
		{ picture("large.jpg", 4000, 3000), 1280, 960, 3, 1 },
		{ gif, 1280, 853, 0, 1 },
		/* Named like a GIF anywhere in the path: treated as one. */
		{ picture("photo.gif.jpg", 2000, 1500), 1280, 960, 0, 1 },
		{ turned(640, 480, 6), 480, 640, -1, 6 },
		{ turned(640, 480, 8), 480, 640, -1, 8 },
		{ turned(2000, 1500, 6), 960, 1280, -1, 6 },
		{ turned(4000, 3000, 8), 960, 1280, 3, 8 },
	};
	int popups_deleted = 0;
	for (const Case &c : cases) {
		SCOPED_TRACE(c.path);
		ASSERT_TRUE(load(c.path));
		EXPECT_TRUE(sd()->loaded && sd()->path && evas_object_visible_get(obj_));
		EXPECT_EQ(sd()->img_w, c.w);
		EXPECT_EQ(sd()->img_h, c.h);
		/* Laid out at its final size, pixels or not. */
		evas_smart_objects_calculate(evas());
		EXPECT_EQ(shown().w, 720);
		if (c.scale_down < 0) {
			EXPECT_EQ(sd()->preload_image, nullptr);
			EXPECT_EQ(sd()->processing_popup, nullptr);
		} else {
			ASSERT_NE(sd()->preload_image, nullptr);
			EXPECT_EQ(evas_object_image_load_scale_down_get(sd()->preload_image), c.scale_down);
			EXPECT_EQ(pixel_size().w, 0) << "no pixels before the preload completes";
			ASSERT_NE(sd()->processing_popup, nullptr);
			EXPECT_TRUE(evas_object_visible_get(sd()->processing_popup));
			evas_object_event_callback_add(sd()->processing_popup, EVAS_CALLBACK_DEL, count_del, &popups_deleted);
			ASSERT_TRUE(wait_for_pixels());
			EXPECT_EQ(popups_deleted, 1);
			popups_deleted = 0;
		}
		EXPECT_EQ(pixel_size(), (Rect{ 0, 0, c.w, c.h }));
		/* 6 turns clockwise: the marked corner goes to the top right;
		 * 8 the other way: to the bottom left. */
		if (c.path == gif)
			expect_colour(c.w - 1, c.h - 1, 0xc83214, 0);
		else if (c.orientation == 6)
			expect_colour(c.w - 2, 1, MARK);
		else if (c.orientation == 8)
			expect_colour(1, c.h - 2, MARK);
		else
			expect_upright();
	}
}

TEST_F(MainImageLoad, PreloadOfACachedPictureCompletesWithoutThePopup)
{
	/* 400x300 in a 100x100 box: factor 4, small enough to stay cached. */
	std::string path = picture("cached.jpg", 400, 300);
	ASSERT_TRUE(load(path, 100, 100));
	EXPECT_NE(sd()->processing_popup, nullptr);
	ASSERT_TRUE(wait_for_pixels());

	add_image();
	ASSERT_TRUE(ie_image_file_load(obj_, path.c_str(), 100, 100));
	EXPECT_TRUE(sd()->preloaded);
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 100, 75 }));
	expect_upright();
	run_for(0.2);
	EXPECT_EQ(sd()->processing_popup, nullptr);
}

TEST_F(MainImageLoad, FilesThatCannotBeLoadedFailWithOneErrorLine)
{
	std::string truncated_png = picture("truncated.png", 640, 480);
	truncate_file(truncated_png, 0.5);
	std::string truncated_jpeg = picture("truncated.jpg", 640, 480);
	truncate_file(truncated_jpeg, 0.02);
	std::string text = scratch_path("notes.jpg");
	std::ofstream(text) << "not a picture\n";
	allow_efl_error("Invalid JPEG file structure");

	for (const std::string &path :
	     { scratch_path("missing.jpg"), dir_, truncated_png, truncated_jpeg, text }) {
		SCOPED_TRACE(path);
		log_clear();
		EXPECT_FALSE(load(path));
		EXPECT_EQ(load_errors(), 1);
		EXPECT_TRUE(!sd()->loaded && !sd()->path && !sd()->processing_popup) << "nothing left behind";
		EXPECT_FALSE(evas_object_visible_get(obj_) || pixel_size().w);
	}
}

TEST_F(MainImageLoad, BackgroundDecodingFailureIsReportedOnceAndNotShown)
{
	std::string damaged = picture("damaged.png", 4000, 3000);
	truncate_file(damaged, 0.5);
	ASSERT_TRUE(load(damaged));
	int failures = 0;
	evas_object_smart_callback_add(obj_, IE_IMAGE_SIGNAL_LOAD_FAILED, count_call, &failures);
	ASSERT_TRUE(run_until([&] { return failures > 0; }));
	run_for(0.1);
	EXPECT_EQ(failures, 1);
	EXPECT_EQ(load_errors(), 1);
	EXPECT_EQ(sd()->processing_popup, nullptr);
	EXPECT_EQ(pixel_size().w, 0) << "an empty render must not become the picture";

	/* A view that takes the (empty) size now: nothing to fit, nothing to
	 * divide by. */
	ie_image_size_update(obj_);
	settle();
	double_tap(win(), 360, 640);
	run_for(0.4);
	pinch(win(), 360, 640, 40, 200);
	EXPECT_EQ(sd()->img_w, 0);

	/* The owner may delete the object when told. */
	ASSERT_TRUE(load(damaged));
	evas_object_smart_callback_add(obj_, IE_IMAGE_SIGNAL_LOAD_FAILED,
		[](void *data, Evas_Object *obj, void *) {
			evas_object_del(obj);
			*static_cast<Evas_Object **>(data) = nullptr;
		}, &obj_);
	ASSERT_TRUE(run_until([&] { return obj_ == nullptr; }));
	run_for(0.2);
}

TEST_F(MainImageLoad, DeletingDuringABackgroundLoadLeavesNothingBehind)
{
	std::string path = picture("large.jpg", 4000, 3000);
	for (bool editor_first : { false, true }) {
		SCOPED_TRACE(editor_first ? "editor first" : "main image first");
		Evas_Object *editor = elm_box_add(win());
		obj_ = ie_image_add(editor);
		evas_object_resize(obj_, 720, 1280);
		evas_image_cache_flush(evas());
		ASSERT_TRUE(ie_image_file_load(obj_, path.c_str(), 720, 1280));
		ASSERT_NE(sd()->processing_popup, nullptr);
		int popups_deleted = 0;
		evas_object_event_callback_add(sd()->processing_popup, EVAS_CALLBACK_DEL, count_del, &popups_deleted);
		if (editor_first) {
			/* The popup and the gesture layer die with the editor's
			 * layout; the main image must not reach for them. */
			evas_object_del(editor);
			EXPECT_EQ(sd()->processing_popup, nullptr);
			EXPECT_EQ(sd()->gesture, nullptr);
			ASSERT_TRUE(wait_for_pixels());
		}
		evas_object_del(obj_);
		obj_ = nullptr;
		EXPECT_EQ(popups_deleted, 1);
		if (!editor_first)
			evas_object_del(editor);
		run_for(0.3);
	}
}

TEST_F(MainImageLoad, BoxAndSizeExtremesNeitherOverflowNorLoseThePicture)
{
	std::string small = picture("small.png", 64, 48);
	ASSERT_TRUE(load(small, INT_MAX, INT_MAX));
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 64, 48 }));
	EXPECT_FALSE(load(small, 0, 0));

	/* Wider than GIF's signed reading of the header: the size comes back
	 * negative and must not pass as a small picture. */
	std::string too_wide = scratch_path("too-wide.gif");
	ASSERT_TRUE(write_flat_gif(too_wide, 40000, 24, 0x102030));
	EXPECT_FALSE(load(too_wide));

	/* Reduced to 100 wide, the short side would round to nothing. */
	ASSERT_TRUE(load(picture("strip.png", 2000, 8), 100, 100));
	ASSERT_TRUE(wait_for_pixels());
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 100, 1 }));
}

} // namespace
} // namespace iet
