/* The effect view and its thumbnails, driven by taps on the real grid items
 * and drags over the real touch area; every picture is checked against the
 * engine's own results, bit for bit. */
#include <dlfcn.h>

#include <media_db.h>

#include "editor-fixture.h"
#include "ie-effect-hooks.h"
#include "ie-engine-private.h"
#include "ie-engine.h"
#include "ie-image.h"

/* Makes the effect grid's N-th append fail, as when memory runs out. */
static int appends_before_refusal = -1;

extern "C" Elm_Object_Item *elm_gengrid_item_append(Evas_Object *obj, const Elm_Gengrid_Item_Class *itc,
						    const void *data, Evas_Smart_Cb func, const void *func_data)
{
	using Real = Elm_Object_Item *(*)(Evas_Object *, const Elm_Gengrid_Item_Class *, const void *, Evas_Smart_Cb,
					  const void *);
	static Real real = reinterpret_cast<Real>(dlsym(RTLD_NEXT, "elm_gengrid_item_append"));
	bool effect_item = itc && itc->item_style && !strcmp(itc->item_style, "imageeditor/effectgrid");
	if (effect_item && appends_before_refusal >= 0 && appends_before_refusal-- == 0)
		return nullptr;
	return real(obj, itc, data, func, func_data);
}

namespace {

constexpr int ROW_VINTAGE = 1;
constexpr int ROW_SUNSHINE = 2;
constexpr int ROW_BLUR = 5;
constexpr int ROW_SEPIA = 10;
constexpr int ROW_SKETCH = 14;
constexpr int ROW_NEGATIVE = 15;
constexpr int TOOL_EFFECT = 3;

using Pixels = std::vector<uint32_t>;

size_t refused_bytes;

Pixels run_effect(Pixels source, int w, int h, int row)
{
	Pixels out(source.size(), 0);
	IEL_Image in = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(source.data())};
	IEL_Image result = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(out.data())};
	EXPECT_EQ(IEL_Run_Effect(&in, &result, unsigned(effect_table[row].effect)), IEL_OK);
	return out;
}

Pixels blend(Pixels effect, Pixels unedited, int w, int h, float alpha)
{
	IEL_Image e = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(effect.data())};
	IEL_Image io = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(unedited.data())};
	EXPECT_EQ(IEL_Alpha_blending(&e, &io, alpha), IEL_OK);
	return unedited;
}

class EffectView : public EditorTest {
protected:
	/* Wide enough for all twenty items: a tap finds every one on screen. */
	void SetUp() override
	{
		win_w = 2600;
		win_h = 1280;
		EditorTest::SetUp();
	}
	void TearDown() override
	{
		ie_effect_hooks = {};
		appends_before_refusal = -1;
		iel_sketch_texture_path_set(nullptr);
		EditorTest::TearDown();
	}

	/* Opens the view with the effect tool and lets it settle. */
	void open_effects()
	{
		tap_tool(TOOL_EFFECT);
		iet::run_idlers();
		ASSERT_NE(vh->effect_grid, nullptr);
		picture_size(&w, &h);
		unedited = picture_pixels();
	}
	Elm_Object_Item *grid_item(int row)
	{
		for (Elm_Object_Item *it = elm_gengrid_first_item_get(vh->effect_grid); it; it = elm_gengrid_item_next_get(it))
			if (static_cast<Ie_Data_Item *>(elm_object_item_data_get(it))->index == row)
				return it;
		return nullptr;
	}
	/* Taps the effect's item and lets the full-size effect run. */
	void pick(int row)
	{
		tap_item(grid_item(row));
		iet::run_idlers();
	}
	Evas_Object *thumbnail(int row)
	{
		return elm_object_item_part_content_get(grid_item(row), "elm.swallow.icon");
	}
	/* A sideways drag over the picture, `steps` moves. */
	void drag_by(int dx, int steps = 10)
	{
		iet::settle();
		Evas_Object *area = evas_object_name_find(evas(), "effect_touch_layout");
		ASSERT_NE(area, nullptr);
		int x, y;
		iet::object_centre(area, &x, &y);
		x -= dx / 2;
		iet::drag(win(), x, y, x + dx, y, steps);
		iet::run_idlers();
	}
	std::string slider_state()
	{
		double value;
		const char *state = edje_object_part_state_get(elm_layout_edje_get(vh->effect_layout), "slider.clip", &value);
		return state ? state : "";
	}
	Pixels effect(int row) { return run_effect(unedited, w, h, row); }

	int w = 0, h = 0;
	Pixels unedited;
};

TEST_F(EffectView, ThumbnailsAreTheCentreOfTheScaledPictureUnderEachEffect)
{
	struct Shape {
		int w, h;
		int thumb_w, thumb_h;
		Evas_Coord fill_x, fill_y, fill_w, fill_h;
	};
	for (const Shape &s : {Shape{4000, 3000, 157, 118, 137, 0, 157, 118}, Shape{3000, 4000, 118, 157, 0, 137, 118, 157},
			       Shape{300, 300, 118, 118, 0, 0, 118, 118}}) {
		SCOPED_TRACE(testing::Message() << s.w << "x" << s.h);
		ASSERT_NE(open_editor_on_picture(s.w, s.h), nullptr);
		open_effects();
		EXPECT_EQ(vh->thumb_width, s.thumb_w);
		EXPECT_EQ(vh->thumb_height, s.thumb_h);

		Pixels scaled(size_t(s.thumb_w) * s.thumb_h);
		IEL_Image in = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(unedited.data())};
		IEL_Image out = {uint32_t(s.thumb_w), uint32_t(s.thumb_h), IEL_FORMAT_BGRA8888,
				 reinterpret_cast<uint8_t *>(scaled.data())};
		ASSERT_EQ(IEL_Resize_Image(&in, &out), IEL_OK);
		ASSERT_EQ(0, memcmp(vh->thumb_buf, scaled.data(), scaled.size() * 4));

		for (int row = 1; row < IE_EFFECT_TABLE_ROWS; row++) {
			SCOPED_TRACE(row);
			Evas_Object *icon = thumbnail(row);
			ASSERT_NE(icon, nullptr);
			Evas_Coord fx, fy, fw, fh;
			evas_object_image_fill_get(icon, &fx, &fy, &fw, &fh);
			EXPECT_EQ(fx, s.fill_x);
			EXPECT_EQ(fy, s.fill_y);
			EXPECT_EQ(fw, s.fill_w);
			EXPECT_EQ(fh, s.fill_h);
			int iw, ih;
			evas_object_image_size_get(icon, &iw, &ih);
			ASSERT_EQ(iw, s.thumb_w);
			ASSERT_EQ(ih, s.thumb_h);
			auto *shown = static_cast<const uint32_t *>(evas_object_image_data_get(icon, EINA_FALSE));
			ASSERT_NE(shown, nullptr);
			Pixels expected = run_effect(scaled, iw, ih, row);
			EXPECT_EQ(0, memcmp(shown, expected.data(), expected.size() * 4));
		}
		destroy_editor();
	}
}

TEST_F(EffectView, ItemsCarryTheTranslatedNameOnlyInTheirTitle)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	EXPECT_STREQ(elm_object_item_part_text_get(grid_item(ROW_SEPIA), "elm.text.title"), "Sepia");
	EXPECT_STREQ(elm_object_item_part_text_get(grid_item(ROW_NEGATIVE), "elm.text.title"), "Negative");
	Ie_Data_Item item = {vh, ROW_SEPIA};
	EXPECT_EQ(_effect_text_get(&item, vh->effect_grid, "elm.text"), nullptr);
}

TEST_F(EffectView, PictureOfNoSizeKeepsTheThumbnailSize)
{
	Viewhandle *bare = IE_INIT();
	ASSERT_NE(bare, nullptr);
	bare->thumb_width = 157;
	bare->thumb_height = 118;
	SetThumbnailBuffer(bare);
	EXPECT_EQ(bare->thumb_width, 157);
	EXPECT_EQ(bare->thumb_height, 118);
	EXPECT_EQ(bare->thumb_buf, nullptr);
	EXPECT_EQ(bare->orig_buf, nullptr);
	free(bare);
}

TEST_F(EffectView, TapShowsTheEffectOfTheUneditedPictureAndEffectsNeverStack)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	EXPECT_TRUE(elm_object_disabled_get(vh->done_btn));

	pick(ROW_SEPIA);
	EXPECT_EQ(picture_pixels(), effect(ROW_SEPIA));
	EXPECT_EQ(vh->effect_index, ROW_SEPIA);
	EXPECT_TRUE(vh->edited);
	EXPECT_TRUE(vh->effect_applied);
	EXPECT_FALSE(elm_object_disabled_get(vh->done_btn));
	EXPECT_STREQ(edje_object_part_text_get(elm_layout_edje_get(vh->slider_layout), "effect-name"), "Sepia");

	/* Again: nothing is computed anew. */
	tap_item(grid_item(ROW_SEPIA));
	EXPECT_EQ(vh->effect_update_idler, nullptr);
	EXPECT_TRUE(elm_gengrid_item_selected_get(grid_item(ROW_SEPIA)));

	pick(ROW_NEGATIVE);
	EXPECT_EQ(picture_pixels(), effect(ROW_NEGATIVE));
	EXPECT_FALSE(elm_gengrid_item_selected_get(grid_item(ROW_SEPIA)));

	/* A row previewed from its thumbnail ends on the full-size result. */
	pick(ROW_VINTAGE);
	int pw, ph;
	picture_size(&pw, &ph);
	EXPECT_EQ(pw, w);
	EXPECT_EQ(ph, h);
	EXPECT_EQ(picture_pixels(), effect(ROW_VINTAGE));
}

TEST_F(EffectView, DragSetsTheIntensityAndThePictureFollowsTheSlider)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	pick(ROW_SEPIA);
	Pixels sepia = effect(ROW_SEPIA);
	EXPECT_EQ(vh->slider_value, 100);

	/* The editor's first blend may be at 0. */
	drag_by(-400, 1);
	EXPECT_EQ(vh->slider_value, 0);
	EXPECT_EQ(picture_pixels(), blend(sepia, unedited, w, h, 0));

	drag_by(360, 1);
	EXPECT_EQ(vh->slider_value, 90);
	EXPECT_EQ(picture_pixels(), blend(sepia, unedited, w, h, 90));
	EXPECT_STREQ(edje_object_part_text_get(elm_layout_edje_get(vh->slider_layout), "value"), "90");

	/* A new effect forgets the last blend: the same value blends again. */
	pick(ROW_NEGATIVE);
	Pixels negative = effect(ROW_NEGATIVE);
	EXPECT_EQ(vh->slider_value, 100);
	drag_by(-40);
	EXPECT_EQ(vh->slider_value, 90);
	EXPECT_EQ(picture_pixels(), blend(negative, unedited, w, h, 90));

	/* Past the end the value stays at 100, and the picture shows 100. */
	drag_by(80);
	EXPECT_EQ(vh->slider_value, 100);
	EXPECT_EQ(picture_pixels(), blend(negative, unedited, w, h, 100));

	/* Between the tenths the release shows the final value. */
	drag_by(-25, 5);
	EXPECT_EQ(vh->slider_value, 94);
	EXPECT_EQ(picture_pixels(), blend(negative, unedited, w, h, 94));
}

TEST_F(EffectView, BlurReblendsOnEveryEleventhValue)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	pick(ROW_BLUR);
	iet::log_clear();
	drag_by(-100, 25);
	std::vector<std::string> blends;
	for (const auto &message : iet::log_messages())
		if (message.rfind("the alpha is ", 0) == 0)
			blends.push_back(message.substr(13));
	EXPECT_EQ(blends, (std::vector<std::string>{"99.000000", "88.000000", "77.000000", "75.000000"}));
	EXPECT_EQ(picture_pixels(), blend(effect(ROW_BLUR), unedited, w, h, 75));
}

TEST_F(EffectView, TouchWithNothingPickedChangesNothing)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	iet::settle();
	Evas_Object *area = evas_object_name_find(evas(), "effect_touch_layout");
	ASSERT_NE(area, nullptr);
	int x, y;
	iet::object_centre(area, &x, &y);
	iet::mouse_down(win(), x, y);
	iet::settle();
	EXPECT_TRUE(vh->slider_hidden);
	EXPECT_EQ(slider_state(), "default");
	iet::mouse_move(win(), x - 200, y);
	iet::mouse_up(win(), x - 200, y);
	iet::run_idlers();
	EXPECT_EQ(picture_pixels(), unedited);
	EXPECT_FALSE(vh->edited);

	pick(ROW_SEPIA);
	iet::mouse_down(win(), x, y);
	iet::run_for(0.3);
	EXPECT_FALSE(vh->slider_hidden);
	EXPECT_EQ(slider_state(), "visible");
	iet::mouse_up(win(), x, y);
}

TEST_F(EffectView, GridRunsAlongTheWindowsLongSide)
{
	elm_win_rotation_set(win(), 90);
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	EXPECT_FALSE(elm_gengrid_horizontal_get(vh->effect_grid));
	Evas_Coord iw, ih;
	elm_gengrid_item_size_get(vh->effect_grid, &iw, &ih);
	EXPECT_EQ(iw, 120);
	EXPECT_EQ(ih, 124);

	elm_win_rotation_set(win(), 0);
	resize_window(1280, 2600);
	iet::run_idlers();
	EXPECT_TRUE(elm_gengrid_horizontal_get(vh->effect_grid));
}

TEST_F(EffectView, EffectToolTogglesAndReopeningStartsFromThePictureShown)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	pick(ROW_SEPIA);
	Pixels sepia = picture_pixels();

	tap_tool(TOOL_EFFECT);
	iet::run_idlers();
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_MAIN);
	EXPECT_EQ(vh->effect_grid, nullptr);
	EXPECT_EQ(vh->effect_index, -1);
	EXPECT_EQ(vh->orig_buf, nullptr);
	EXPECT_EQ(vh->effect_buf, nullptr);
	EXPECT_EQ(vh->thumb_buf, nullptr);
	EXPECT_EQ(picture_pixels(), sepia);

	open_effects();
	EXPECT_EQ(unedited, sepia);
	pick(ROW_NEGATIVE);
	Pixels negative = run_effect(sepia, w, h, ROW_NEGATIVE);
	EXPECT_EQ(picture_pixels(), negative);

	/* Left through another tool, the view forgets its pick as well. */
	tap_tool(2);
	iet::run_idlers();
	open_effects();
	pick(ROW_NEGATIVE);
	EXPECT_EQ(picture_pixels(), effect(ROW_NEGATIVE));
	EXPECT_NE(picture_pixels(), unedited);
}

TEST_F(EffectView, HalfBuiltViewStillClosesWithTheTool)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	appends_before_refusal = 3;
	tap_tool(TOOL_EFFECT);
	iet::run_idlers();
	EXPECT_EQ(iet::log_count("append error"), 1);
	ASSERT_NE(vh->effect_grid, nullptr);
	EXPECT_EQ(elm_gengrid_items_count(vh->effect_grid), 3u);

	tap_tool(TOOL_EFFECT);
	iet::run_idlers();
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_MAIN);
	EXPECT_EQ(vh->effect_grid, nullptr);
	EXPECT_EQ(vh->effect_items, nullptr);
}

TEST_F(EffectView, DoneAfterAnEffectAndADragSavesTheBlend)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	pick(ROW_SUNSHINE);
	drag_by(-40);
	Pixels shown = picture_pixels();
	ASSERT_EQ(shown, blend(effect(ROW_SUNSHINE), unedited, w, h, 90));

	iet::tap_object(vh->done_btn);
	ASSERT_TRUE(wait_for_close());
	ASSERT_EQ(close_requests.size(), 1u);
	std::string path = close_requests[0];
	EXPECT_EQ(path, picture_dir + "/photo_e001.jpg");

	Evas_Object *check = evas_object_image_add(evas());
	evas_object_image_file_set(check, path.c_str(), nullptr);
	int sw = 0, sh = 0;
	evas_object_image_size_get(check, &sw, &sh);
	ASSERT_EQ(sw, w);
	ASSERT_EQ(sh, h);
	auto *saved = static_cast<const uint32_t *>(evas_object_image_data_get(check, EINA_FALSE));
	ASSERT_NE(saved, nullptr);
	long total = 0;
	int worst = 0;
	for (size_t i = 0; i < shown.size(); i++)
		for (int shift = 0; shift < 24; shift += 8) {
			int d = std::abs(int((saved[i] >> shift) & 0xff) - int((shown[i] >> shift) & 0xff));
			worst = std::max(worst, d);
			total += d;
		}
	evas_object_del(check);
	EXPECT_LT(worst, 64) << "JPEG noise only";
	EXPECT_LT(double(total) / (shown.size() * 3), 4.0);

	Media_Db_Row row;
	ASSERT_EQ(media_db_lookup(path.c_str(), &row), MEDIA_DB_ERROR_NONE);
	EXPECT_EQ(row.width, w);
}

TEST_F(EffectView, CancelAfterAnEffectAsksBeforeDiscarding)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	pick(ROW_SEPIA);
	iet::tap_object(vh->cancel_btn);
	iet::settle();
	ASSERT_NE(vh->popup, nullptr);
	EXPECT_STREQ(evas_object_name_get(vh->popup), "deletepopup");
	EXPECT_TRUE(close_requests.empty());
}

TEST_F(EffectView, FailedEffectLeavesThePictureAndTheFlags)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	refused_bytes = size_t(w) * h * 4;
	ie_effect_hooks.refuse_buffer = [](size_t bytes) { return bytes == refused_bytes; };

	/* Nothing picked yet: the picture stays unedited and nothing is picked. */
	pick(ROW_SEPIA);
	EXPECT_EQ(picture_pixels(), unedited);
	EXPECT_FALSE(vh->edited);
	EXPECT_FALSE(vh->effect_applied);
	EXPECT_EQ(vh->effect_index, -1);
	EXPECT_FALSE(elm_gengrid_item_selected_get(grid_item(ROW_SEPIA)));
	EXPECT_EQ(iet::log_count("Output.pbBuf is null Calloc Failed"), 1);

	/* After a blend, the same blend stays and the pick goes back to it;
	 * also for a row previewed from its thumbnail. */
	ie_effect_hooks.refuse_buffer = nullptr;
	pick(ROW_NEGATIVE);
	drag_by(-40);
	Pixels blended = picture_pixels();
	vh->edited = EINA_FALSE;
	vh->effect_applied = EINA_FALSE;
	ie_effect_hooks.refuse_buffer = [](size_t bytes) { return bytes == refused_bytes; };
	for (int row : {ROW_SEPIA, ROW_VINTAGE}) {
		SCOPED_TRACE(row);
		pick(row);
		int pw, ph;
		picture_size(&pw, &ph);
		EXPECT_EQ(pw, w);
		EXPECT_EQ(picture_pixels(), blended);
		EXPECT_FALSE(vh->edited);
		EXPECT_FALSE(vh->effect_applied);
		EXPECT_EQ(vh->effect_index, ROW_NEGATIVE);
		EXPECT_TRUE(elm_gengrid_item_selected_get(grid_item(ROW_NEGATIVE)));
		EXPECT_STREQ(edje_object_part_text_get(elm_layout_edje_get(vh->slider_layout), "effect-name"), "Negative");
	}

	/* An effect code the libraries refuse. */
	ie_effect_hooks.refuse_buffer = nullptr;
	ie_effect_hooks.effect_code = [](int row) { return row == ROW_SEPIA ? 21 : effect_table[row].effect; };
	pick(ROW_SEPIA);
	EXPECT_EQ(picture_pixels(), blended);
	EXPECT_EQ(vh->effect_index, ROW_NEGATIVE);
	EXPECT_FALSE(vh->edited);
}

TEST_F(EffectView, RefusedEffectsGiveNoThumbnailAndLeaveThePicture)
{
	/* The sketch cannot read its texture; row 10 runs a code the libraries
	 * do not know. */
	iel_sketch_texture_path_set("/nonexistent/sketch.raw");
	ie_effect_hooks.effect_code = [](int row) { return row == ROW_SEPIA ? 21 : effect_table[row].effect; };
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	EXPECT_EQ(thumbnail(ROW_SKETCH), nullptr);
	EXPECT_EQ(thumbnail(ROW_SEPIA), nullptr);
	EXPECT_NE(thumbnail(ROW_NEGATIVE), nullptr);
	for (int row : {ROW_SKETCH, ROW_SEPIA}) {
		pick(row);
		EXPECT_EQ(picture_pixels(), unedited);
		EXPECT_FALSE(vh->edited);
		EXPECT_EQ(vh->effect_index, -1);
	}
}

TEST_F(EffectView, UnpreparedBuffersLeaveEveryEffectAndDragWithoutEffect)
{
	/* The full-size copy cannot be made when the view opens. */
	refused_bytes = size_t(64) * 48 * 4;
	ie_effect_hooks.refuse_buffer = [](size_t bytes) { return bytes == refused_bytes; };
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	ie_effect_hooks.refuse_buffer = nullptr;
	EXPECT_EQ(iet::log_count("main_image_buf  is null Calloc failed"), 1);
	EXPECT_EQ(vh->thumb_buf, nullptr);
	EXPECT_EQ(thumbnail(ROW_SEPIA), nullptr);
	pick(ROW_SEPIA);
	drag_by(-40);
	EXPECT_EQ(picture_pixels(), unedited);
	EXPECT_FALSE(vh->edited);
}

TEST_F(EffectView, ClosingRightAfterATapRunsNothingOnTheClosedView)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	open_effects();
	/* Another tool right after the tap: the pending effect never runs. */
	tap_item(grid_item(ROW_SEPIA));
	ASSERT_NE(vh->effect_update_idler, nullptr);
	tap_tool(2);
	iet::run_idlers();
	EXPECT_EQ(vh->effect_update_idler, nullptr);
	EXPECT_FALSE(vh->effect_applied);
	int pw, ph;
	picture_size(&pw, &ph);
	EXPECT_EQ(pw, h) << "only the rotation happened";

	/* The editor destroyed with both idlers pending. */
	tap_tool(TOOL_EFFECT);
	iet::settle();
	tap_item(grid_item(ROW_NEGATIVE));
	ASSERT_NE(vh->effect_update_idler, nullptr);
	ASSERT_NE(vh->effect_grid_idler, nullptr);
	destroy_editor();
	iet::run_idlers();
}

} // namespace
