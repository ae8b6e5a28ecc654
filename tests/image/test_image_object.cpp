/* The main image object in a real headless window: fitting, and zoom and
 * pan driven by real mouse and multi-touch events through its gesture
 * layer. */
#include <algorithm>

#include "image_test_fixture.h"

namespace iet {
namespace {

class MainImageObject : public MainImageTest {
protected:
	/* A 400x200 picture in a 360x600 area at (0, 100): fitted to
	 * 360x180 at (0, 310), fit scale 0.9, largest zoom 1440x720. */
	void load_wide_picture()
	{
		add_image(0, 100, 360, 600);
		ASSERT_TRUE(ie_image_file_load(obj_, picture("wide.png", 400, 200).c_str(), 720, 1280));
		settle();
	}

	/* Lets the gesture layer forget the previous taps. */
	void pause_between_gestures() { run_for(0.4); }

	static constexpr Rect FITTED = { 0, 310, 360, 180 };
};

TEST_F(MainImageObject, FitsWidthLimitedAndHeightLimitedPictures)
{
	load_wide_picture();
	EXPECT_EQ(shown(), FITTED);
	EXPECT_DOUBLE_EQ(sd()->scale, 0.9);
	EXPECT_TRUE(sd()->fitted);

	evas_object_del(obj_);
	add_image(0, 100, 360, 600);
	ASSERT_TRUE(ie_image_file_load(obj_, picture("tall.png", 200, 400).c_str(), 720, 1280));
	settle();
	EXPECT_EQ(shown(), (Rect{ 30, 100, 300, 600 }));
	EXPECT_DOUBLE_EQ(sd()->scale, 1.5);
}

TEST_F(MainImageObject, RefitsOnNewAreaButNotOnSameGeometry)
{
	load_wide_picture();

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
}

TEST_F(MainImageObject, DoubleTapZoomsAroundThePointAndBack)
{
	load_wide_picture();

	/* Picture pixel (100, 100) is under (90, 400) and stays there. */
	double_tap(win(), 90, 400);
	EXPECT_EQ(shown(), (Rect{ -270, 40, 1440, 720 }));
	EXPECT_FALSE(sd()->fitted);
	EXPECT_DOUBLE_EQ(sd()->scale, 3.6);

	/* A zoomed picture keeps its place through a layout pass. */
	settle();
	EXPECT_EQ(shown(), (Rect{ -270, 40, 1440, 720 }));

	pause_between_gestures();
	double_tap(win(), 90, 400);
	EXPECT_EQ(shown(), FITTED);
	EXPECT_TRUE(sd()->fitted);
}

TEST_F(MainImageObject, PinchStopsAtFourTimesAndAtTheFitScale)
{
	load_wide_picture();

	pinch(win(), 180, 400, 40, 400);
	EXPECT_EQ(shown().w, 1440);
	EXPECT_EQ(shown().h, 720);
	EXPECT_FALSE(sd()->fitted);
	settle();
	EXPECT_EQ(shown().w, 1440);

	pause_between_gestures();
	pinch(win(), 180, 400, 400, 40);
	EXPECT_TRUE(sd()->fitted);
	settle();
	EXPECT_EQ(shown(), FITTED);
}

TEST_F(MainImageObject, DragPansAZoomedPictureUpToTheAreaEdges)
{
	load_wide_picture();

	/* A fitted picture is no larger than the area: it does not move. */
	drag(win(), 180, 400, 280, 450);
	EXPECT_EQ(shown(), FITTED);

	pause_between_gestures();
	double_tap(win(), 90, 400);
	ASSERT_EQ(shown(), (Rect{ -270, 40, 1440, 720 }));

	/* The gesture layer reports a drag from its second move on. */
	pause_between_gestures();
	drag(win(), 100, 400, 150, 400);
	EXPECT_NEAR(shown().x, -270 + 50, 5);
	EXPECT_EQ(shown().y, 40);

	pause_between_gestures();
	drag(win(), 20, 150, 700, 700);
	EXPECT_EQ(shown(), (Rect{ 0, 100, 1440, 720 })) << "left and top edges stop at the area's";

	for (int i = 0; i < 4; i++) {
		pause_between_gestures();
		drag(win(), 350, 690, 10, 150);
	}
	EXPECT_EQ(shown(), (Rect{ 360 - 1440, 700 - 720, 1440, 720 })) << "right and bottom edges likewise";
}

TEST_F(MainImageObject, CropModeLeavesOneFingerDragsToOthers)
{
	load_wide_picture();
	double_tap(win(), 90, 400);
	ASSERT_EQ(shown(), (Rect{ -270, 40, 1440, 720 }));
	ie_image_mode_set(obj_, IE_IMAGE_MODE_CROP);

	pause_between_gestures();
	drag(win(), 100, 400, 150, 400);
	EXPECT_EQ(shown(), (Rect{ -270, 40, 1440, 720 }));

	pause_between_gestures();
	two_finger_drag(win(), 100, 400, 60, 60, 0);
	EXPECT_NE(shown().x, -270);
	EXPECT_EQ(shown().w, 1440);
}

TEST_F(MainImageObject, ModeSetAppliesOnlyChanges)
{
	load_wide_picture();

	/* A new object takes input although its mode is passive. */
	EXPECT_FALSE(evas_object_pass_events_get(obj_));
	ie_image_mode_set(obj_, IE_IMAGE_MODE_PASSIVE);
	EXPECT_FALSE(evas_object_pass_events_get(obj_));

	ie_image_mode_set(obj_, IE_IMAGE_MODE_NORMAL);
	evas_object_pass_events_set(obj_, EINA_TRUE);
	ie_image_mode_set(obj_, IE_IMAGE_MODE_NORMAL);
	EXPECT_TRUE(evas_object_pass_events_get(obj_));

	ie_image_mode_set(obj_, IE_IMAGE_MODE_ACTIVE);
	EXPECT_FALSE(evas_object_pass_events_get(obj_));
	ie_image_mode_set(obj_, IE_IMAGE_MODE_PASSIVE);
	EXPECT_TRUE(evas_object_pass_events_get(obj_));

	/* Passive: the gesture layer sees nothing. */
	double_tap(win(), 90, 400);
	EXPECT_EQ(shown(), FITTED);
}

TEST_F(MainImageObject, DisabledGesturesDoNothing)
{
	load_wide_picture();
	ie_image_zoom_enabled_set(obj_, EINA_FALSE);
	ie_image_double_tap_enabled_set(EINA_FALSE, obj_);

	pinch(win(), 180, 400, 40, 400);
	pause_between_gestures();
	double_tap(win(), 90, 400);
	EXPECT_EQ(shown(), FITTED);

	ie_image_double_tap_enabled_set(EINA_TRUE, obj_);
	pause_between_gestures();
	double_tap(win(), 90, 400);
	EXPECT_EQ(shown().w, 1440);
}

TEST_F(MainImageObject, GesturesWithoutAPictureDoNothing)
{
	add_image(0, 100, 360, 600);
	evas_object_show(obj_);
	evas_object_show(ie_image_object_get(obj_));
	evas_object_resize(ie_image_object_get(obj_), 360, 600);
	evas_object_move(ie_image_object_get(obj_), 0, 100);
	settle();

	double_tap(win(), 90, 400);
	pause_between_gestures();
	pinch(win(), 180, 400, 40, 400);
	pause_between_gestures();
	drag(win(), 100, 400, 150, 400);
	ie_image_refit(obj_);
	settle();
	EXPECT_EQ(shown(), (Rect{ 0, 100, 360, 600 }));
	EXPECT_FALSE(sd()->loaded);
}

TEST_F(MainImageObject, ReplacedPixelsAreFittedAfterSizeUpdate)
{
	load_wide_picture();
	double_tap(win(), 90, 400);

	/* What a view does when the picture changes size. */
	Evas_Object *image = ie_image_object_get(obj_);
	evas_object_image_data_set(image, NULL);
	evas_object_image_size_set(image, 100, 300);
	auto *pixels = static_cast<uint32_t *>(evas_object_image_data_get(image, EINA_TRUE));
	ASSERT_NE(pixels, nullptr);
	std::fill(pixels, pixels + 100 * 300, 0xff336699u);
	evas_object_image_data_update_add(image, 0, 0, 100, 300);
	ie_image_size_update(obj_);
	settle();

	EXPECT_EQ(shown(), (Rect{ 80, 100, 200, 600 }));
	auto *read = static_cast<uint32_t *>(ie_image_data_get(obj_));
	ASSERT_NE(read, nullptr);
	EXPECT_EQ(read[100 * 300 - 1], 0xff336699u);
}

} // namespace
} // namespace iet
