/* The crop view through real input: the crop tool tapped, the selection box
 * dragged by its handles, the picture pinched with two fingers, the window
 * turned, and Done and Cancel tapped. */
#include <fstream>

#include <media_db.h>
#include <vantric_log_manager.h>

#include "editor-fixture.h"
#include "ie-engine.h"
#include "ie-idler.h"
#include "ie-image.h"
#include "ie-selectbox-private.h"

namespace {

struct Rect {
	int x, y, w, h;
};

class CropView : public EditorTest {
protected:
	void tap_button(Evas_Object *button)
	{
		ASSERT_NE(button, nullptr);
		iet::tap_object(button);
		iet::settle();
	}
	/* The crop tool, and the box once the loop went idle. */
	void open_crop()
	{
		tap_tool(0);
		iet::run_idlers();
		ASSERT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_CROP);
		ASSERT_NE(vh->selectbox, nullptr);
	}
	Rect region() const
	{
		Rect r{};
		ie_selectbox_get_region(vh->selectbox, &r.x, &r.y, &r.w, &r.h);
		return r;
	}
	Rect shown() const
	{
		Rect r{};
		ie_image_geometry_get(vh->main_image, &r.x, &r.y, &r.w, &r.h);
		return r;
	}
	/* Presses a point of the box (a handle's or the middle's) and drags it
	 * by (dx, dy) in ten moves. */
	void drag_box(double fx, double fy, int dx, int dy)
	{
		Rect r = region();
		int x = r.x + static_cast<int>(r.w * fx), y = r.y + static_cast<int>(r.h * fy);
		iet::drag(win(), x, y, x + dx, y + dy);
	}
	/* Two fingers spread (or closed) about the picture's centre until the
	 * zoom stops at its limit. */
	void pinch_picture(int gap0, int gap1)
	{
		Rect p = shown();
		iet::pinch(win(), p.x + p.w / 2, p.y + p.h / 2, gap0, gap1);
		/* Let the gesture layer forget this gesture. */
		iet::run_for(0.4);
	}
	/* A quick pinch back to the fitted picture: the box sees the picture
	 * only as it was before the last step, so it stays where it is. */
	void snap_back_to_fit()
	{
		iet::finger_down(win(), 0, 360, 1000);
		iet::finger_down(win(), 1, 560, 1000);
		iet::finger_move(win(), 1, 590, 1000);
		iet::finger_move(win(), 1, 370, 1000);
		iet::finger_up(win(), 1, 370, 1000);
		iet::finger_up(win(), 0, 360, 1000);
		iet::settle();
		iet::run_for(0.4);
	}
	/* What the picture on screen must be after Done: the engine's copy of
	 * the shown pixels under the rectangle, mapped as Done maps it. */
	std::vector<uint32_t> expected_crop(Rect cut, int *cw, int *ch)
	{
		int iw, ih;
		picture_size(&iw, &ih);
		auto pixels = picture_pixels();
		Rect p = shown();
		float kx = static_cast<float>(iw) / p.w, ky = static_cast<float>(ih) / p.h;
		/* Never less than one pixel. */
		*cw = std::max(1, static_cast<int>(cut.w * kx));
		*ch = std::max(1, static_cast<int>(cut.h * ky));
		std::vector<uint32_t> out(static_cast<size_t>(*cw) * *ch, 0xdeadbeef);
		IEL_Image src = {static_cast<uint32_t>(iw), static_cast<uint32_t>(ih), IEL_FORMAT_BGRA8888,
				 reinterpret_cast<uint8_t *>(pixels.data())};
		IEL_Image dst = {static_cast<uint32_t>(*cw), static_cast<uint32_t>(*ch), IEL_FORMAT_BGRA8888,
				 reinterpret_cast<uint8_t *>(out.data())};
		EXPECT_EQ(IEL_Crop_Image(&src, &dst, static_cast<int>((cut.x - p.x) * kx),
					 static_cast<int>((cut.y - p.y) * ky)),
			  IEL_OK);
		return out;
	}
	/* Done on the box as it stands: the picture becomes exactly the
	 * engine's crop of the shown pixels, cut within the buffer it lay in.
	 * Returns the crop and its size. */
	std::vector<uint32_t> done_cuts_in_place(int *cw, int *ch)
	{
		const void *buffer = evas_object_image_data_get(inner_image(), EINA_FALSE);
		auto expected = expected_crop(region(), cw, ch);
		tap_button(vh->done_btn);
		int w, h;
		picture_size(&w, &h);
		EXPECT_EQ(w, *cw);
		EXPECT_EQ(h, *ch);
		EXPECT_TRUE(picture_pixels() == expected);
		EXPECT_EQ(evas_object_image_data_get(inner_image(), EINA_FALSE), buffer) << "no new memory";
		return expected;
	}
	void expect_colour(const Selectbox_Smart_Data *sd, int r, int g, int b)
	{
		for (Evas_Object *o : {sd->lines[LINE_TOP], sd->lines[LINE_RIGHT], sd->handles[HANDLE_TOP_LEFT],
				       sd->handles[HANDLE_TOP]}) {
			int cr, cg, cb, ca;
			evas_object_color_get(o, &cr, &cg, &cb, &ca);
			EXPECT_EQ(cr, r);
			EXPECT_EQ(cg, g);
			EXPECT_EQ(cb, b);
			EXPECT_EQ(ca, 255);
		}
	}
	/* Largest difference of any colour channel: JPEG noise stays small. */
	static int worst_difference(const uint32_t *a, const uint32_t *b, size_t n)
	{
		int worst = 0;
		for (size_t i = 0; i < n; i++)
			for (int shift = 0; shift < 24; shift += 8)
				worst = std::max(worst, std::abs(int((a[i] >> shift) & 0xff) - int((b[i] >> shift) & 0xff)));
		return worst;
	}
	bool select_box_on_canvas() const { return evas_object_name_find(evas(), "SelectBox") != nullptr; }
	/* The saved file is a w x h picture showing `expected` up to JPEG noise. */
	void expect_saved_as(const std::string &path, const std::vector<uint32_t> &expected, int w, int h)
	{
		Evas_Object *check = evas_object_image_add(evas());
		evas_object_image_file_set(check, path.c_str(), nullptr);
		int sw = 0, sh = 0;
		evas_object_image_size_get(check, &sw, &sh);
		EXPECT_EQ(sw, w);
		EXPECT_EQ(sh, h);
		auto *pixels = static_cast<const uint32_t *>(evas_object_image_data_get(check, EINA_FALSE));
		if (sw == w && sh == h && pixels)
			EXPECT_LT(worst_difference(pixels, expected.data(), expected.size()), 40) << "JPEG noise only";
		else
			ADD_FAILURE() << "no picture to compare in " << path;
		evas_object_del(check);
	}
};

TEST_F(CropView, OpensInTheWindowsOrientationAndRecordsItsUse)
{
	ASSERT_NE(open_editor_on_picture(640, 480), nullptr);
	static std::vector<std::string> signals;
	signals.clear();
	elm_layout_signal_callback_add(
		vh->layout, "crop,*", "elm",
		[](void *, Evas_Object *, const char *emission, const char *) { signals.push_back(emission); }, nullptr);

	open_crop();
	EXPECT_EQ(signals, std::vector<std::string>{"crop,portrait"});
	EXPECT_FALSE(elm_object_disabled_get(vh->done_btn));
	/* The box starts centred on the picture in the free mode. */
	Rect p = shown(), r = region();
	EXPECT_EQ(r.w, 400);
	EXPECT_EQ(r.h, p.h / 2);
	EXPECT_EQ(r.y, p.y + p.h / 4);

	tap_button(vh->cancel_btn);
	elm_win_rotation_set(win(), 90);
	resize_window(1280, 720);
	open_crop();
	EXPECT_EQ(signals, (std::vector<std::string>{"crop,portrait", "crop,landscape"}));
	EXPECT_EQ(vantric_log_manager_count_entries("feature", "CROP"), 2);
}

TEST_F(CropView, LeavingKeepsDoneOnlyForAChangedPicture)
{
	ASSERT_NE(open_editor_on_picture(640, 480), nullptr);
	open_crop();
	tap_button(vh->cancel_btn);
	EXPECT_TRUE(elm_object_disabled_get(vh->done_btn));
	EXPECT_FALSE(vh->edited);

	/* A rotation, or an effect, came first: the picture is still changed. */
	tap_tool(2);
	open_crop();
	tap_button(vh->cancel_btn);
	EXPECT_FALSE(elm_object_disabled_get(vh->done_btn));
	EXPECT_TRUE(vh->edited);

	destroy_editor();
	ASSERT_NE(open_editor_on_picture(640, 480), nullptr);
	vh->effect_applied = EINA_TRUE;
	open_crop();
	EXPECT_FALSE(vh->edited) << "the crop tool starts from a clean slate";
	tap_button(vh->cancel_btn);
	EXPECT_FALSE(elm_object_disabled_get(vh->done_btn));
	EXPECT_TRUE(vh->edited);
}

TEST_F(CropView, BoxWearsTheThemeColourAndFollowsItsChanges)
{
	ASSERT_NE(open_editor_on_picture(640, 480), nullptr);
	open_crop();
	expect_colour(_selectbox_data_get(vh->selectbox), 41, 182, 246);

	std::string table_path = iet::temp_dir() + "/colours.xml";
	std::ofstream(table_path) << "<ColorTable><ColorCode id=\"AO004\"><Color r=\"200\" g=\"10\" b=\"20\" a=\"255\"/>"
				     "</ColorCode></ColorTable>";
	Assist_Colour_Table *table = ea_theme_color_table_new(table_path.c_str());
	ASSERT_NE(table, nullptr);
	ea_theme_object_colors_set(vh->layout, table, ASSIST_STYLE_DARK);
	ea_theme_color_table_free(table);
	ea_theme_changed_notify(ASSIST_THEME_EVENT_COLOUR);
	expect_colour(_selectbox_data_get(vh->selectbox), 200, 10, 20);

	/* Once the view and then the editor are gone, a theme change reaches
	 * neither. */
	tap_button(vh->cancel_btn);
	ea_theme_changed_notify(ASSIST_THEME_EVENT_COLOUR);
	open_crop();
	destroy_editor();
	ea_theme_changed_notify(ASSIST_THEME_EVENT_COLOUR);
}

TEST_F(CropView, BoxCreationNeverOutlivesTheView)
{
	ASSERT_NE(open_editor_on_picture(640, 480), nullptr);
	static bool other_work_ran;
	other_work_ran = false;

	/* Cancel before the loop went idle: no box appears later, and the
	 * editor's other pending work still runs. */
	tap_tool(0);
	ASSERT_NE(vh->crop_layout, nullptr);
	ASSERT_EQ(vh->selectbox, nullptr);
	ie_idler_add(vh, [](void *) -> Eina_Bool {
		other_work_ran = true;
		return ECORE_CALLBACK_CANCEL;
	});
	tap_button(vh->cancel_btn);
	iet::run_idlers();
	EXPECT_TRUE(other_work_ran);
	EXPECT_EQ(vh->selectbox, nullptr);
	EXPECT_FALSE(select_box_on_canvas());

	/* The editor destroyed with the crop view still waiting for its box. */
	tap_tool(0);
	destroy_editor();
	iet::run_idlers();
	EXPECT_FALSE(select_box_on_canvas());
}

TEST_F(CropView, DoneCropsThePictureAndTheNextDoneSavesIt)
{
	/* Held reduced to 1280 x 960 in the 720 x 1280 window. */
	ASSERT_NE(open_editor_on_picture(4000, 3000), nullptr);
	int w, h;
	picture_size(&w, &h);
	ASSERT_EQ(w, 1280);
	ASSERT_EQ(h, 960);
	const auto original = picture_pixels();

	/* Cancel after a drag changes nothing. */
	open_crop();
	drag_box(1.0, 1.0, -200, -150);
	tap_button(vh->cancel_btn);
	picture_size(&w, &h);
	EXPECT_EQ(w, 1280);
	EXPECT_EQ(h, 960);
	EXPECT_TRUE(picture_pixels() == original);
	EXPECT_FALSE(vh->edited);

	open_crop();
	const Rect before = region();
	drag_box(1.0, 1.0, -200, -150);
	const Rect cut = region();
	EXPECT_EQ(cut.x, before.x);
	EXPECT_EQ(cut.y, before.y);
	EXPECT_EQ(cut.w, before.w - 200);
	EXPECT_EQ(cut.h, before.h - 150);
	int cw, ch;
	const auto expected = expected_crop(cut, &cw, &ch);

	tap_button(vh->done_btn);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_MAIN);
	EXPECT_TRUE(close_requests.empty());
	EXPECT_TRUE(vh->edited);
	EXPECT_FALSE(elm_object_disabled_get(vh->done_btn));
	picture_size(&w, &h);
	ASSERT_EQ(w, cw);
	ASSERT_EQ(h, ch);
	EXPECT_TRUE(picture_pixels() == expected);
	/* The cropped picture is shown fitted. */
	Rect p = shown();
	EXPECT_TRUE(p.w == 720 || p.x == (720 - p.w) / 2) << p.x << " " << p.w;

	tap_button(vh->done_btn);
	ASSERT_TRUE(wait_for_close());
	ASSERT_EQ(close_requests.size(), 1u);
	const std::string saved = close_requests[0];
	ASSERT_EQ(saved, picture_dir + "/photo_e001.jpg");
	expect_saved_as(saved, expected, cw, ch);
	Media_Db_Row row;
	ASSERT_EQ(media_db_lookup(saved.c_str(), &row), MEDIA_DB_ERROR_NONE);
	EXPECT_EQ(row.width, cw);
	EXPECT_EQ(row.height, ch);
}

TEST_F(CropView, ASecondCropCutsTheCroppedPictureWhereItLies)
{
	ASSERT_NE(open_editor_on_picture(4000, 3000), nullptr);
	open_crop();
	drag_box(1.0, 1.0, -200, -150);
	tap_button(vh->done_btn);

	open_crop();
	drag_box(0.0, 0.0, 100, 80);
	int cw, ch;
	const auto expected = done_cuts_in_place(&cw, &ch);

	/* On screen it is the new picture, not what the buffer held before:
	 * its corners and middle show the colours of the crop's own. */
	const Rect p = shown();
	for (const auto &f : {std::pair{0.02, 0.02}, std::pair{0.5, 0.5}, std::pair{0.97, 0.97}}) {
		const uint32_t want = expected[static_cast<size_t>(f.second * ch) * cw + static_cast<size_t>(f.first * cw)];
		const uint32_t got = iet::screen_pixel(win(), p.x + static_cast<int>(f.first * p.w),
						       p.y + static_cast<int>(f.second * p.h));
		EXPECT_LT(worst_difference(&got, &want, 1), 8) << std::hex << got << " for " << want;
	}

	tap_button(vh->done_btn);
	ASSERT_TRUE(wait_for_close());
	ASSERT_EQ(close_requests.size(), 1u);
	expect_saved_as(close_requests[0], expected, cw, ch);
}

/* However the picture came to be on screen (opened at its own size, turned,
 * or with an effect on it), Done's crop cuts the shown pixels where they
 * lie, Cancel in the crop view leaves them as they are, and the next Done
 * saves the cut. */
TEST_F(CropView, EveryPictureIsCutWhereItLiesAndSaved)
{
	constexpr int TOOL_ROTATE_RIGHT = 2, TOOL_EFFECT = 3;
	const struct {
		const char *name;
		int tool;
	} ways[] = {{"opened at its own size", -1}, {"turned", TOOL_ROTATE_RIGHT}, {"with an effect", TOOL_EFFECT}};
	for (const auto &way : ways) {
		SCOPED_TRACE(way.name);
		/* Wide enough for the effect strip to show its first item. */
		if (way.tool == TOOL_EFFECT)
			resize_window(2600, 1280);
		ASSERT_NE(open_editor_on_picture(640, 480), nullptr);
		const auto opened = picture_pixels();
		if (way.tool >= 0)
			tap_tool(way.tool);
		if (way.tool == TOOL_EFFECT) {
			iet::run_idlers();
			ASSERT_NE(vh->effect_grid, nullptr);
			tap_item(elm_gengrid_first_item_get(vh->effect_grid));
			iet::run_idlers();
		}
		const auto before = picture_pixels();
		EXPECT_EQ(before != opened, way.tool >= 0);
		int w, h;
		picture_size(&w, &h);

		open_crop();
		drag_box(0.0, 0.0, 60, 40);
		tap_button(vh->cancel_btn);
		int cancelled_w, cancelled_h;
		picture_size(&cancelled_w, &cancelled_h);
		EXPECT_EQ(cancelled_w, w);
		EXPECT_EQ(cancelled_h, h);
		EXPECT_TRUE(picture_pixels() == before);

		open_crop();
		drag_box(1.0, 1.0, -100, -60);
		int cw, ch;
		const auto expected = done_cuts_in_place(&cw, &ch);

		tap_button(vh->done_btn);
		ASSERT_TRUE(wait_for_close());
		ASSERT_EQ(close_requests.size(), 1u);
		expect_saved_as(close_requests[0], expected, cw, ch);
		destroy_editor();
		close_requests.clear();
	}
}

TEST_F(CropView, AnAppliedCropIsNeverForgotten)
{
	ASSERT_NE(open_editor_on_picture(640, 480), nullptr);
	open_crop();
	drag_box(1.0, 1.0, -100, -50);
	tap_button(vh->done_btn);
	int cw, ch;
	picture_size(&cw, &ch);
	ASSERT_LT(cw, 640);
	const auto cropped = picture_pixels();

	/* A second visit left with Cancel: the picture is still not the file. */
	open_crop();
	tap_button(vh->cancel_btn);
	EXPECT_TRUE(vh->edited);
	EXPECT_FALSE(elm_object_disabled_get(vh->done_btn));
	tap_button(vh->cancel_btn);
	ASSERT_NE(vh->popup, nullptr);
	EXPECT_STREQ(evas_object_name_get(vh->popup), "deletepopup");
	EXPECT_TRUE(close_requests.empty());

	tap_button(elm_object_part_content_get(vh->popup, "button1"));
	tap_button(vh->done_btn);
	ASSERT_TRUE(wait_for_close());
	ASSERT_EQ(close_requests.size(), 1u);
	expect_saved_as(close_requests[0], cropped, cw, ch);
}

TEST_F(CropView, SecondFingerPausesTheBoxWhichThenKeepsToThePicture)
{
	ASSERT_NE(open_editor_on_picture(1280, 960), nullptr);
	open_crop();
	const Rect start = region();
	const Rect fitted = shown();

	/* While a second finger is down the first one does not move the box;
	 * lifted, the first finger drags on. */
	iet::finger_down(win(), 0, 300, 700);
	iet::finger_down(win(), 1, 500, 600);
	iet::finger_move(win(), 0, 250, 650);
	iet::finger_move(win(), 0, 240, 640);
	EXPECT_EQ(region().x, start.x);
	EXPECT_EQ(region().y, start.y);
	iet::finger_up(win(), 1, 500, 600);
	iet::finger_move(win(), 0, 250, 650);
	iet::finger_up(win(), 0, 250, 650);
	iet::settle();
	EXPECT_EQ(region().x, start.x + 10);
	EXPECT_EQ(region().y, start.y + 10);
	iet::run_for(0.4);

	/* Zoomed in, the box is made taller than the fitted picture; pinched
	 * back, it becomes a square half the picture's width, inside it. */
	pinch_picture(40, 400);
	ASSERT_GT(shown().w, fitted.w);
	drag_box(0.5, 0.0, 0, 150 - region().y);
	drag_box(0.5, 1.0, 0, 1200 - region().y - region().h);
	ASSERT_GT(region().h, fitted.h);
	iet::finger_down(win(), 0, 300, 688);
	iet::finger_down(win(), 1, 500, 688);
	iet::finger_move(win(), 1, 530, 688);
	iet::finger_move(win(), 1, 310, 688);
	iet::finger_move(win(), 1, 311, 688);
	iet::finger_up(win(), 1, 311, 688);
	iet::finger_up(win(), 0, 300, 688);
	iet::settle();
	const Rect p = shown();
	ASSERT_EQ(p.w, fitted.w);
	const Rect r = region();
	EXPECT_EQ(r.w, p.w / 2);
	EXPECT_EQ(r.h, r.w);
	EXPECT_GE(r.y, p.y);
	EXPECT_LE(r.y + r.h, p.y + p.h);
}

TEST_F(CropView, DoneKeepsToThePartOfTheRectangleOverThePicture)
{
	/* A quick pinch leaves the box where it was over the zoomed picture:
	 * above the fitted one, across its top edge, or 5 pixels into a
	 * picture shown far larger than its pixels. */
	const struct {
		const char *name;
		int w, h;
		int top, bottom;
	} cases[] = {
		{"beside the picture", 1280, 960, 150, 300},
		{"across its top edge", 1280, 960, 300, 500},
		{"less than a pixel into it", 64, 48, 300, 423},
	};
	for (const auto &c : cases) {
		SCOPED_TRACE(c.name);
		destroy_editor();
		ASSERT_NE(open_editor_on_picture(c.w, c.h), nullptr);
		const auto original = picture_pixels();
		open_crop();
		pinch_picture(40, 400);
		drag_box(0.5, 0.0, 0, c.top - region().y);
		drag_box(0.5, 1.0, 0, c.bottom - region().y - region().h);
		snap_back_to_fit();
		const Rect p = shown(), r = region();
		ASSERT_EQ(r.y, c.top);
		ASSERT_EQ(r.y + r.h, c.bottom);
		ASSERT_LT(r.y, p.y) << "the box starts above the picture";

		int cw = c.w, ch = c.h;
		const auto expected = r.y + r.h > p.y ? expected_crop({r.x, p.y, r.w, r.y + r.h - p.y}, &cw, &ch) : original;
		tap_button(vh->done_btn);
		int w, h;
		picture_size(&w, &h);
		ASSERT_EQ(w, cw);
		ASSERT_EQ(h, ch);
		EXPECT_TRUE(picture_pixels() == expected);
		EXPECT_EQ(vh->edited, r.y + r.h > p.y);
	}
}

TEST_F(CropView, WindowRotationKeepsTheToolBarHiddenAndTheBoxOnThePicture)
{
	ASSERT_NE(open_editor_on_picture(1280, 960), nullptr);
	open_crop();
	const Rect p0 = shown(), r0 = region();

	elm_win_rotation_set(win(), 90);
	resize_window(1280, 720);
	const char *state = edje_object_part_state_get(elm_layout_edje_get(vh->layout), "elm.swallow.ctrlbar", nullptr);
	EXPECT_STREQ(state, "landscape_hidden");
	/* The box sits on the same part of the picture at its new place. */
	const Rect p1 = shown(), r1 = region();
	ASSERT_NE(p1.w, p0.w);
	EXPECT_NEAR(r1.x - p1.x, double(r0.x - p0.x) * p1.w / p0.w, 1);
	EXPECT_NEAR(r1.y - p1.y, double(r0.y - p0.y) * p1.h / p0.h, 1);
	EXPECT_NEAR(r1.w, double(r0.w) * p1.w / p0.w, 1);
	EXPECT_NEAR(r1.h, double(r0.h) * p1.h / p0.h, 1);
	/* ... and never reaches past the screen. */
	EXPECT_LE(r1.x + r1.w, 1280);
	EXPECT_LE(r1.y + r1.h, 720);

	elm_win_rotation_set(win(), 0);
	resize_window(720, 1280);
	const Rect r2 = region();
	EXPECT_NEAR(r2.x, r0.x, 2);
	EXPECT_NEAR(r2.y, r0.y, 2);
	EXPECT_NEAR(r2.w, r0.w, 2);
	EXPECT_NEAR(r2.h, r0.h, 2);
}

} // namespace
