/* The main image object in a headless window: fitting, zoom and pan driven
 * by real mouse and multi-touch events through its gesture layer, and
 * pixels handed over to it. */
#include <platform_log.h>

#include <cstdlib>
#include <cstring>

#include "image_test_fixture.h"

namespace iet {
namespace {

/* A 400x200 picture in a 360x600 area at (0, 100) is fitted at scale 0.9;
 * 4x around (90, 400) keeps picture pixel (100, 100) there. */
constexpr Rect FITTED = { 0, 310, 360, 180 }, ZOOMED = { -270, 40, 1440, 720 };

class MainImageObject : public MainImageTest {
protected:
	void load_picture(int w, int h)
	{
		add_image(0, 100, 360, 600);
		std::string path = picture(std::to_string(w) + "x" + std::to_string(h) + ".png", w, h);
		ASSERT_TRUE(ie_image_file_load(obj_, path.c_str(), 720, 1280));
		settle();
	}

	/* Lets the gesture layer forget the previous gesture. */
	void pause() { run_for(0.4); }
};

TEST_F(MainImageObject, FitsAndRefitsOnlyOnANewGeometry)
{
	load_picture(400, 200);
	EXPECT_EQ(shown(), FITTED);
	EXPECT_DOUBLE_EQ(sd()->scale, 0.9);
	EXPECT_TRUE(sd()->fitted);

	evas_object_resize(obj_, 720, 1000);
	EXPECT_EQ(shown(), (Rect{ 0, 420, 720, 360 }));
	evas_object_move(obj_, 10, 0);
	EXPECT_EQ(shown(), (Rect{ 10, 320, 720, 360 }));

	/* Displace the picture by hand: only a calculation would put it back. */
	Evas_Object *image = ie_image_object_get(obj_);
	evas_object_move(image, 5, 5);
	evas_object_move(obj_, 10, 0);
	evas_object_resize(obj_, 720, 1000);
	Rect r{};
	evas_object_geometry_get(image, &r.x, &r.y, &r.w, &r.h);
	EXPECT_EQ(r, (Rect{ 5, 5, 720, 360 }));

	load_picture(200, 400);
	EXPECT_EQ(shown(), (Rect{ 30, 100, 300, 600 }));
	EXPECT_DOUBLE_EQ(sd()->scale, 1.5);
}

TEST_F(MainImageObject, DoubleTapZoomsAndDragPansUpToTheAreaEdges)
{
	load_picture(400, 200);
	/* A fitted picture is no larger than the area: it does not move. */
	drag(win(), 180, 400, 280, 450);
	EXPECT_EQ(shown(), FITTED);

	pause();
	double_tap(win(), 90, 400);
	EXPECT_EQ(shown(), ZOOMED);
	EXPECT_DOUBLE_EQ(sd()->scale, 3.6);
	EXPECT_FALSE(sd()->fitted);
	/* A zoomed picture keeps its place through a layout pass. */
	settle();
	ASSERT_EQ(shown(), ZOOMED);

	pause();
	drag(win(), 100, 400, 150, 400);
	/* The gesture layer reports a drag from its second move on. */
	EXPECT_NEAR(shown().x, -270 + 50, 5);
	EXPECT_EQ(shown().y, 40);
	pause();
	drag(win(), 20, 150, 700, 700);
	EXPECT_EQ(shown(), (Rect{ 0, 100, 1440, 720 })) << "left and top edges stop at the area's";
	for (int i = 0; i < 4; i++) {
		pause();
		drag(win(), 350, 690, 10, 150);
	}
	EXPECT_EQ(shown(), (Rect{ 360 - 1440, 700 - 720, 1440, 720 })) << "right and bottom edges likewise";

	pause();
	double_tap(win(), 90, 400);
	EXPECT_EQ(shown(), FITTED);
	EXPECT_TRUE(sd()->fitted);
}

TEST_F(MainImageObject, PinchStopsAtFourTimesAndAtTheFitScale)
{
	load_picture(400, 200);
	pinch(win(), 180, 400, 40, 400);
	settle();
	EXPECT_EQ(shown().w, 1440);
	EXPECT_FALSE(sd()->fitted);

	pause();
	pinch(win(), 180, 400, 400, 40);
	EXPECT_TRUE(sd()->fitted);
	settle();
	EXPECT_EQ(shown(), FITTED);
}

TEST_F(MainImageObject, CropModePansWithTwoFingersOnly)
{
	load_picture(400, 200);
	double_tap(win(), 90, 400);
	ASSERT_EQ(shown(), ZOOMED);
	ie_image_mode_set(obj_, IE_IMAGE_MODE_CROP);

	pause();
	drag(win(), 100, 400, 150, 400);
	EXPECT_EQ(shown(), ZOOMED);
	pause();
	two_finger_drag(win(), 100, 400, 60, 60, 0);
	EXPECT_NE(shown().x, -270);
	EXPECT_EQ(shown().w, 1440);
}

/* A malloc'd picture, left half red and right half blue. */
static uint32_t *halves(int w, int h)
{
	auto *pixels = static_cast<uint32_t *>(malloc(static_cast<size_t>(w) * h * 4));
	for (int y = 0; y < h; y++)
		for (int x = 0; x < w; x++)
			pixels[y * w + x] = x < w / 2 ? 0xffff0000 : 0xff0000ff;
	return pixels;
}

TEST_F(MainImageObject, HandedOverPixelsAreShownAsTheyAreAndFreedOnceReplaced)
{
	/* Under ASan the frees below are checked too: a buffer freed twice,
	 * or one never freed, fails the run. */
	load_picture(400, 200);
	uint32_t *first = halves(40, 20);
	ASSERT_TRUE(ie_image_pixels_take(obj_, first, 40, 20));
	ie_image_size_update(obj_);
	settle();
	Evas_Object *image = ie_image_object_get(obj_);
	EXPECT_EQ(evas_object_image_data_get(image, EINA_FALSE), first) << "shown without a copy";
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 40, 20 }));
	EXPECT_TRUE(ie_image_pixels_owned(obj_, first));
	/* Fitted 360 x 180 at (0, 310): a quarter and three quarters across. */
	EXPECT_EQ(screen_pixel(win(), 90, 400), 0xffff0000u);
	EXPECT_EQ(screen_pixel(win(), 270, 400), 0xff0000ffu);

	/* Reworked in place: the right half, moved to the buffer's start. */
	auto *pixels = static_cast<uint32_t *>(ie_image_data_get(obj_));
	ASSERT_EQ(pixels, first);
	for (int y = 0; y < 20; y++)
		memmove(pixels + y * 20, pixels + y * 40 + 20, 20 * 4);
	ASSERT_TRUE(ie_image_pixels_take(obj_, pixels, 20, 20));
	ie_image_size_update(obj_);
	settle();
	EXPECT_EQ(evas_object_image_data_get(image, EINA_FALSE), first);
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 20, 20 }));
	/* Fitted 360 x 360 at (0, 220): no red left anywhere on it. */
	for (int x : {5, 90, 180, 270, 355})
		EXPECT_EQ(screen_pixel(win(), x, 400), 0xff0000ffu) << x;

	/* Another buffer replaces it: the first is freed. */
	ASSERT_TRUE(ie_image_pixels_take(obj_, halves(10, 10), 10, 10));
	EXPECT_FALSE(ie_image_pixels_owned(obj_, first));

	/* Pixels put in through Evas, as the rotate and effect views do: the
	 * buffer goes as soon as the picture takes another size, or with the
	 * size update that follows a picture of the same size. */
	for (int side : {40, 30}) {
		ASSERT_TRUE(ie_image_pixels_take(obj_, halves(30, 30), 30, 30));
		evas_object_image_data_set(image, NULL);
		evas_object_image_size_set(image, side, side);
		if (side != 30) {
			EXPECT_EQ(sd()->own_pixels, nullptr);
		}
		void *evas_pixels = evas_object_image_data_get(image, EINA_TRUE);
		ASSERT_NE(evas_pixels, nullptr);
		memset(evas_pixels, 0xff, static_cast<size_t>(side) * side * 4);
		evas_object_image_data_set(image, evas_pixels);
		ie_image_size_update(obj_);
		EXPECT_EQ(sd()->own_pixels, nullptr);
		settle();
		EXPECT_EQ(screen_pixel(win(), 180, 400), 0xffffffffu);
	}

	/* A size Evas cannot take is refused: both buffers are freed. */
	ASSERT_TRUE(ie_image_pixels_take(obj_, halves(10, 10), 10, 10));
	iet::log_clear();
	EXPECT_FALSE(ie_image_pixels_take(obj_, halves(4, 4), 0, 4));
	EXPECT_EQ(iet::log_count("Cannot show a 0x4 picture", PLATFORM_LOG_ERROR), 1);
	EXPECT_EQ(sd()->own_pixels, nullptr);

	/* Deleted while showing one: freed with the object. */
	ASSERT_TRUE(ie_image_pixels_take(obj_, halves(10, 10), 10, 10));
	evas_object_del(obj_);
	obj_ = nullptr;
	settle();
}

TEST_F(MainImageObject, ModeSetAppliesOnlyChanges)
{
	load_picture(400, 200);
	ie_image_mode_set(obj_, IE_IMAGE_MODE_NORMAL);
	evas_object_pass_events_set(obj_, EINA_TRUE);
	ie_image_mode_set(obj_, IE_IMAGE_MODE_NORMAL);
	EXPECT_TRUE(evas_object_pass_events_get(obj_));
	ie_image_mode_set(obj_, IE_IMAGE_MODE_ACTIVE);
	EXPECT_FALSE(evas_object_pass_events_get(obj_));

	/* Passive: the gesture layer sees nothing. */
	ie_image_mode_set(obj_, IE_IMAGE_MODE_PASSIVE);
	double_tap(win(), 90, 400);
	EXPECT_EQ(shown(), FITTED);
}

TEST_F(MainImageObject, GesturesWithNothingLoadedDoNothing)
{
	add_image(0, 100, 360, 600);
	Evas_Object *image = ie_image_object_get(obj_);
	evas_object_show(obj_);
	evas_object_show(image);
	evas_object_move(image, 0, 100);
	evas_object_resize(image, 360, 600);
	settle();

	double_tap(win(), 90, 400);
	pause();
	pinch(win(), 180, 400, 40, 400);
	pause();
	drag(win(), 100, 400, 150, 400);
	ie_image_refit(obj_);
	settle();
	EXPECT_EQ(shown(), (Rect{ 0, 100, 360, 600 }));
}

} // namespace
} // namespace iet
