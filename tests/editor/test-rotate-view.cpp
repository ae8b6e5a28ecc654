/* Quarter turns of the picture on screen. */
#include "editor-fixture.h"
#include "ie-image.h"
#include "ie-save.h"

namespace {

using RotateView = EditorTest;

TEST_F(RotateView, RightTurnReadsColumnsUpwardAndLeftTurnDownward)
{
	ASSERT_NE(open_editor_on_picture(640, 480), nullptr);
	auto src = picture_pixels();
	const int W = 640, H = 480;

	ie_create_rotate_view(vh, 1);
	int w, h;
	picture_size(&w, &h);
	ASSERT_EQ(w, 480);
	ASSERT_EQ(h, 640);
	auto right = picture_pixels();
	for (int j = 0; j < w; j++)
		ASSERT_EQ(right[j], src[(H - 1 - j) * W + 0]) << "first row is the first column read upward, at " << j;
	EXPECT_TRUE(vh->edited);
	EXPECT_TRUE(vh->rotated);
	EXPECT_FALSE(elm_object_disabled_get(vh->done_btn));

	ie_create_rotate_view(vh, 3);
	ie_create_rotate_view(vh, 3);
	auto left = picture_pixels();
	for (int j = 0; j < 480; j++)
		ASSERT_EQ(left[j], src[j * W + (W - 1)]) << "first row is the last column read downward, at " << j;
}

TEST_F(RotateView, FourRightTurnsRestoreThePixels)
{
	ASSERT_NE(open_editor_on_picture(37, 23), nullptr);
	auto start = picture_pixels();
	for (int i = 0; i < 4; i++)
		ie_create_rotate_view(vh, 1);
	int w, h;
	picture_size(&w, &h);
	EXPECT_EQ(w, 37);
	EXPECT_EQ(h, 23);
	EXPECT_EQ(picture_pixels(), start);
}

TEST_F(RotateView, EachTurnShowsThePictureFitted)
{
	ASSERT_NE(open_editor_on_picture(640, 480), nullptr);
	Evas_Coord ax, ay, aw, ah;
	evas_object_geometry_get(vh->main_image, &ax, &ay, &aw, &ah);
	ASSERT_GT(aw, 0);
	iet::double_tap(win(), ax + aw / 2, ay + ah / 2);
	Evas_Coord x, y, w, h;
	ie_image_geometry_get(vh->main_image, &x, &y, &w, &h);
	ASSERT_GT(w, aw) << "the double tap zoomed in";

	ie_create_rotate_view(vh, 1);
	iet::settle();
	ie_image_geometry_get(vh->main_image, &x, &y, &w, &h);
	/* A 480 x 640 picture fitted into the area: it touches two opposite
	 * edges and is centred along the other direction. */
	EXPECT_TRUE(w == aw || h == ah) << w << "x" << h << " in " << aw << "x" << ah;
	EXPECT_LE(w, aw);
	EXPECT_LE(h, ah);
	EXPECT_NEAR(x + w / 2, ax + aw / 2, 1);
	EXPECT_NEAR(y + h / 2, ay + ah / 2, 1);
}

} // namespace

namespace {

/* Pictures at the limits of what a viewer hands over: a single pixel, a
 * one-pixel line, a strip far wider than the screen. */
TEST_F(RotateView, ExtremeShapesRotateAndSave)
{
	for (auto [w, h] : {std::pair{1, 1}, std::pair{1, 7}, std::pair{10000, 10}}) {
		ASSERT_NE(open_editor_on_picture(w, h), nullptr) << w << "x" << h;
		ie_create_rotate_view(vh, 1);
		iet::settle();
		int rw, rh;
		picture_size(&rw, &rh);
		EXPECT_EQ(rw, h);
		EXPECT_EQ(rh, w);
		std::string expected = ie_save_path_get();
		iet::tap_object(vh->done_btn);
		// The editor closes once the saved file is registered.
		iet::run_until([this] { return !close_requests.empty(); });
		ASSERT_EQ(close_requests.size(), 1u) << w << "x" << h;
		EXPECT_EQ(close_requests[0], expected);
		Evas_Object *check = evas_object_image_add(evas());
		evas_object_image_file_set(check, expected.c_str(), nullptr);
		evas_object_image_size_get(check, &rw, &rh);
		EXPECT_EQ(rw, h);
		EXPECT_EQ(rh, w);
		evas_object_del(check);
		close_requests.clear();
		destroy_editor();
	}
}

} // namespace
