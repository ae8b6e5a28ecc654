/* Picture loading with real files: full size, reduced at once, reduced in
 * the background behind the processing popup, EXIF orientation, and the
 * files that cannot be loaded. */
#include <climits>

#include <unistd.h>

#include "ie-config.h"

#include "image_files.h"
#include "image_test_fixture.h"

namespace iet {
namespace {

struct Rgb {
	int r, g, b;
};

constexpr Rgb MARK = { 255, 255, 255 };

class MainImageLoad : public MainImageTest {
protected:
	void SetUp() override
	{
		MainImageTest::SetUp();
		/* The theme may not be built in this tree; the popup survives it. */
		allow_efl_error("processing_view_layout");
	}

	Eina_Bool load(const std::string &path, int box_w = 720, int box_h = 1280)
	{
		if (!obj_)
			add_image(0, 0, 720, 1280);
		return ie_image_file_load(obj_, path.c_str(), box_w, box_h);
	}

	/* Background loads only: the decoded picture must not be cached yet. */
	void forget_decoded_pictures() { evas_image_cache_flush(evas()); }

	bool wait_for_pixels()
	{
		return run_until([this] { return pixel_size().w > 0 && !sd()->processing_popup; });
	}

	Rgb pixel(int x, int y)
	{
		Rect size = pixel_size();
		auto *pixels = static_cast<const uint32_t *>(ie_image_data_get(obj_));
		if (!pixels || x < 0 || y < 0 || x >= size.w || y >= size.h) {
			ADD_FAILURE() << "no pixel at " << x << ", " << y;
			return {};
		}
		uint32_t p = pixels[(size_t)y * size.w + x];
		return { int(p >> 16 & 0xff), int(p >> 8 & 0xff), int(p & 0xff) };
	}

	/* JPEG and resampling blur colours a little. */
	void expect_colour(int x, int y, Rgb want, int tolerance = 28)
	{
		Rgb got = pixel(x, y);
		EXPECT_NEAR(got.r, want.r, tolerance) << "red at " << x << ", " << y;
		EXPECT_NEAR(got.g, want.g, tolerance) << "green at " << x << ", " << y;
		EXPECT_NEAR(got.b, want.b, tolerance) << "blue at " << x << ", " << y;
	}

	/* write_picture's marked gradient, upright: mark at the top left. */
	void expect_upright_picture()
	{
		Rect s = pixel_size();
		expect_colour(1, 1, MARK);
		expect_colour(s.w - 1, s.h - 1, { 255, 255, 96 });
		expect_colour(s.w - 1, 0, { 255, 0, 96 });
	}

	int load_errors() const
	{
		int count = 0;
		for (const auto &message : log_messages())
			count += message.rfind("could not load image. error string is \"", 0) == 0;
		return count;
	}
};

TEST_F(MainImageLoad, PictureWithinTheBoxLoadsAsIs)
{
	ASSERT_TRUE(load(picture("small.jpg", 640, 480)));
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 640, 480 }));
	EXPECT_EQ(sd()->img_w, 640);
	EXPECT_EQ(sd()->img_h, 480);
	EXPECT_EQ(sd()->preload_image, nullptr);
	EXPECT_EQ(sd()->processing_popup, nullptr);
	EXPECT_TRUE(sd()->loaded);
	EXPECT_NE(sd()->path, nullptr);
	EXPECT_TRUE(evas_object_visible_get(obj_));
	settle();
	EXPECT_EQ(shown(), (Rect{ 0, 370, 720, 540 }));
	expect_upright_picture();
}

TEST_F(MainImageLoad, ModerateReductionsAreResampledAtOnce)
{
	struct Case {
		int w, h;
		Rect target;
	} cases[] = {
		{ 2000, 1500, { 0, 0, 1280, 960 } }, /* decoder at full size */
		{ 3000, 2000, { 0, 0, 1280, 853 } }, /* decoder at half size */
		{ 1500, 2400, { 0, 0, 800, 1280 } }, /* portrait */
	};
	for (const Case &c : cases) {
		SCOPED_TRACE(testing::Message() << c.w << "x" << c.h);
		add_image(0, 0, 720, 1280);
		ASSERT_TRUE(load(picture("moderate.jpg", c.w, c.h)));
		EXPECT_EQ(pixel_size(), c.target);
		EXPECT_EQ(sd()->img_w, c.target.w);
		EXPECT_EQ(sd()->img_h, c.target.h);
		EXPECT_EQ(sd()->preload_image, nullptr);
		EXPECT_EQ(sd()->processing_popup, nullptr);
		expect_upright_picture();
		evas_object_del(obj_);
		obj_ = nullptr;
	}
}

TEST_F(MainImageLoad, LargePictureLoadsInTheBackgroundBehindThePopup)
{
	std::string path = picture("large.jpg", 4000, 3000);
	forget_decoded_pictures();
	ASSERT_TRUE(load(path));

	ASSERT_NE(sd()->preload_image, nullptr);
	EXPECT_EQ(evas_object_image_load_scale_down_get(sd()->preload_image), 3);
	EXPECT_EQ(sd()->img_w, 1280);
	EXPECT_EQ(sd()->img_h, 960);
	EXPECT_EQ(pixel_size().w, 0) << "no pixels before the preload completes";
	Evas_Object *popup = sd()->processing_popup;
	ASSERT_NE(popup, nullptr);
	EXPECT_TRUE(evas_object_visible_get(popup));
	bool popup_deleted = false;
	evas_object_event_callback_add(popup, EVAS_CALLBACK_DEL,
		[](void *data, Evas *, Evas_Object *, void *) { *static_cast<bool *>(data) = true; }, &popup_deleted);
	auto *progressbar = static_cast<Evas_Object *>(evas_object_data_get(popup, "progressbar"));
	ASSERT_NE(progressbar, nullptr);
	EXPECT_TRUE(elm_progressbar_pulse_get(progressbar));
	Evas_Object *body = elm_object_part_content_get(popup, NULL);
	ASSERT_NE(body, nullptr);
	if (access(RES_DIR "edje/image-editor.edj", R_OK) == 0) {
		EXPECT_STREQ(elm_object_part_text_get(body, "elm.text"), "IDS_360V_TPOP_LOADING_ING");
		EXPECT_EQ(elm_object_part_content_get(body, "processing"), progressbar);
		EXPECT_STREQ(elm_object_style_get(progressbar), "process_medium");
	}

	/* Already laid out at its final size. */
	evas_smart_objects_calculate(evas());
	EXPECT_EQ(shown(), (Rect{ 0, 370, 720, 540 }));

	ASSERT_TRUE(wait_for_pixels());
	EXPECT_TRUE(popup_deleted);
	EXPECT_FALSE(sd()->preloaded);
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 1280, 960 }));
	expect_upright_picture();
}

TEST_F(MainImageLoad, PreloadThatCompletesAtOnceShowsNoPopup)
{
	/* 400x300 in a 100x100 box: factor 4, small enough to stay cached. */
	std::string path = picture("cached.jpg", 400, 300);
	ASSERT_TRUE(load(path, 100, 100));
	ASSERT_TRUE(wait_for_pixels());
	evas_object_del(obj_);
	obj_ = nullptr;

	ASSERT_TRUE(load(path, 100, 100));
	EXPECT_TRUE(sd()->preloaded);
	EXPECT_EQ(sd()->processing_popup, nullptr);
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 100, 75 }));
	expect_upright_picture();
	run_for(0.2);
	EXPECT_EQ(sd()->processing_popup, nullptr);
}

TEST_F(MainImageLoad, GifAndWbmpLoadInTheBackgroundWithoutScaleDown)
{
	std::string gif = scratch_path("flat.gif");
	ASSERT_TRUE(write_flat_gif(gif, 3000, 3000, 0xc83214));
	std::string wbmp = scratch_path("half.wbmp");
	ASSERT_TRUE(write_half_wbmp(wbmp, 1200, 1000));
	/* Named like a GIF anywhere in the path: treated as one. */
	std::string jpeg_named_gif = picture("photo.gif.jpg", 2000, 1500);

	struct Case {
		std::string path;
		Rect target;
	} cases[] = {
		{ gif, { 0, 0, 1280, 1280 } },
		{ wbmp, { 0, 0, 1280, 1066 } },
		{ jpeg_named_gif, { 0, 0, 1280, 960 } },
	};
	for (const Case &c : cases) {
		SCOPED_TRACE(c.path);
		forget_decoded_pictures();
		add_image(0, 0, 720, 1280);
		ASSERT_TRUE(load(c.path));
		ASSERT_NE(sd()->preload_image, nullptr);
		EXPECT_EQ(evas_object_image_load_scale_down_get(sd()->preload_image), 0);
		EXPECT_NE(sd()->processing_popup, nullptr);
		ASSERT_TRUE(wait_for_pixels());
		EXPECT_EQ(pixel_size(), c.target);
		if (c.path == gif) {
			expect_colour(0, 0, { 0xc8, 0x32, 0x14 }, 0);
			expect_colour(1279, 1279, { 0xc8, 0x32, 0x14 }, 0);
		} else if (c.path == wbmp) {
			expect_colour(10, 10, { 255, 255, 255 }, 0);
			expect_colour(1270, 1000, { 0, 0, 0 }, 0);
		} else {
			expect_upright_picture();
		}
		evas_object_del(obj_);
		obj_ = nullptr;
	}
}

TEST_F(MainImageLoad, ExifOrientationTurnsThePictureOnEveryPath)
{
	struct Case {
		int w, h, orientation;
		Rect target;
	} cases[] = {
		{ 640, 480, 6, { 0, 0, 480, 640 } },    /* as is */
		{ 640, 480, 8, { 0, 0, 480, 640 } },
		{ 2000, 1500, 6, { 0, 0, 960, 1280 } }, /* resampled */
		{ 4000, 3000, 8, { 0, 0, 960, 1280 } }, /* background */
	};
	for (const Case &c : cases) {
		SCOPED_TRACE(testing::Message() << c.w << "x" << c.h << " orientation " << c.orientation);
		std::string path = picture("turned" + std::to_string(c.w) + "-" + std::to_string(c.orientation) + ".jpg",
					   c.w, c.h);
		ASSERT_TRUE(add_exif_orientation(path, c.orientation));
		forget_decoded_pictures();
		add_image(0, 0, 720, 1280);
		ASSERT_TRUE(load(path));
		ASSERT_TRUE(wait_for_pixels());
		EXPECT_EQ(pixel_size(), c.target);
		EXPECT_EQ(sd()->img_w, c.target.w);
		EXPECT_EQ(sd()->img_h, c.target.h);
		/* 6 turns clockwise: the marked corner goes to the top right;
		 * 8 turns the other way: to the bottom left. */
		if (c.orientation == 6)
			expect_colour(c.target.w - 2, 1, MARK);
		else
			expect_colour(1, c.target.h - 2, MARK);
		evas_object_del(obj_);
		obj_ = nullptr;
	}
}

TEST_F(MainImageLoad, FilesThatCannotBeLoadedFailWithOneErrorLine)
{
	std::string truncated_png = picture("truncated.png", 640, 480);
	ASSERT_TRUE(truncate_file(truncated_png, 0.5));
	std::string truncated_jpeg = picture("truncated.jpg", 640, 480);
	ASSERT_TRUE(truncate_file(truncated_jpeg, 0.02));
	std::string text = scratch_path("notes.jpg");
	ASSERT_TRUE(write_text_file(text, "not a picture\n"));
	/* Beyond what the decoders accept. */
	std::string enormous = scratch_path("enormous.png");
	allow_efl_error("Invalid JPEG file structure");
	ASSERT_TRUE(write_png_header_only(enormous, 70000, 70000));

	for (const std::string &path :
	     { scratch_path("missing.jpg"), dir_, truncated_png, truncated_jpeg, text, enormous }) {
		SCOPED_TRACE(path);
		log_clear();
		add_image(0, 0, 720, 1280);
		EXPECT_FALSE(load(path));
		EXPECT_EQ(load_errors(), 1);
		EXPECT_FALSE(sd()->loaded);
		EXPECT_EQ(sd()->path, nullptr);
		EXPECT_FALSE(evas_object_visible_get(obj_));
		EXPECT_EQ(pixel_size().w, 0);
		EXPECT_EQ(sd()->processing_popup, nullptr);
		evas_object_del(obj_);
		obj_ = nullptr;
	}
}

TEST_F(MainImageLoad, BackgroundDecodingFailureIsNotShownAsThePicture)
{
	std::string path = picture("damaged.png", 4000, 3000);
	ASSERT_TRUE(truncate_file(path, 0.5));
	forget_decoded_pictures();
	ASSERT_TRUE(load(path));
	int failures = 0;
	evas_object_smart_callback_add(obj_, IE_IMAGE_SIGNAL_LOAD_FAILED,
		[](void *data, Evas_Object *, void *) { ++*static_cast<int *>(data); }, &failures);

	ASSERT_TRUE(run_until([&] { return failures > 0; }));
	run_for(0.1);
	EXPECT_EQ(failures, 1);
	EXPECT_EQ(sd()->processing_popup, nullptr);
	EXPECT_EQ(pixel_size().w, 0) << "an empty render must not become the picture";
	EXPECT_EQ(load_errors(), 1);

	/* A view that takes the (empty) size now: nothing to fit, nothing to
	 * divide by. */
	ie_image_size_update(obj_);
	settle();
	double_tap(win(), 360, 640);
	run_for(0.4);
	pinch(win(), 360, 640, 40, 200);
	EXPECT_EQ(sd()->img_w, 0);
}

TEST_F(MainImageLoad, OwnerMayDeleteTheObjectWhenTheBackgroundLoadFails)
{
	std::string path = picture("damaged.png", 4000, 3000);
	ASSERT_TRUE(truncate_file(path, 0.5));
	forget_decoded_pictures();
	ASSERT_TRUE(load(path));
	evas_object_smart_callback_add(obj_, IE_IMAGE_SIGNAL_LOAD_FAILED,
		[](void *data, Evas_Object *obj, void *) {
			evas_object_del(obj);
			*static_cast<Evas_Object **>(data) = nullptr;
		}, &obj_);
	ASSERT_TRUE(run_until([&] { return obj_ == nullptr; }));
	run_for(0.2);
}

TEST_F(MainImageLoad, SecondLoadUnloadsAndLoadsNothing)
{
	ASSERT_TRUE(load(picture("first.png", 64, 48)));
	EXPECT_FALSE(load(picture("second.png", 32, 32)));
	EXPECT_FALSE(sd()->loaded);
	EXPECT_EQ(sd()->path, nullptr);
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 64, 48 }));
}

TEST_F(MainImageLoad, BoxExtremesNeitherOverflowNorLoseThePicture)
{
	std::string small = picture("small.png", 64, 48);
	ASSERT_TRUE(load(small, INT_MAX, INT_MAX));
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 64, 48 }));
	evas_object_del(obj_);
	obj_ = nullptr;

	EXPECT_FALSE(load(small, 0, 0));
	evas_object_del(obj_);
	obj_ = nullptr;

	/* Wider than GIF's signed reading of the header: the size comes back
	 * negative and must not pass as a small picture. */
	std::string too_wide = scratch_path("too-wide.gif");
	ASSERT_TRUE(write_flat_gif(too_wide, 40000, 24, 0x102030));
	EXPECT_FALSE(load(too_wide));
	evas_object_del(obj_);
	obj_ = nullptr;

	/* Reduced to 100 wide, the short side would round to nothing. */
	ASSERT_TRUE(load(picture("strip.png", 2000, 8), 100, 100));
	ASSERT_TRUE(wait_for_pixels());
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 100, 1 }));
}

TEST_F(MainImageLoad, DeletingDuringABackgroundLoadLeavesNothingBehind)
{
	std::string path = picture("large.jpg", 4000, 3000);

	/* The main image goes first, as when the editor is destroyed. */
	Evas_Object *editor = elm_box_add(win());
	obj_ = ie_image_add(editor);
	evas_object_resize(obj_, 720, 1280);
	forget_decoded_pictures();
	ASSERT_TRUE(load(path));
	Evas_Object *popup = sd()->processing_popup;
	ASSERT_NE(popup, nullptr);
	bool popup_deleted = false;
	evas_object_event_callback_add(popup, EVAS_CALLBACK_DEL,
		[](void *data, Evas *, Evas_Object *, void *) { *static_cast<bool *>(data) = true; }, &popup_deleted);
	evas_object_del(obj_);
	obj_ = nullptr;
	EXPECT_TRUE(popup_deleted);
	evas_object_del(editor);
	run_for(0.5);

	/* The editor's layout goes first: the popup and the gesture layer
	 * die with it, and the main image must not reach for them. */
	editor = elm_box_add(win());
	obj_ = ie_image_add(editor);
	evas_object_resize(obj_, 720, 1280);
	forget_decoded_pictures();
	ASSERT_TRUE(load(path));
	ASSERT_NE(sd()->processing_popup, nullptr);
	evas_object_del(editor);
	EXPECT_EQ(sd()->processing_popup, nullptr);
	EXPECT_EQ(sd()->gesture, nullptr);
	ASSERT_TRUE(wait_for_pixels());
	evas_object_del(obj_);
	obj_ = nullptr;
	run_for(0.2);
}

} // namespace
} // namespace iet
