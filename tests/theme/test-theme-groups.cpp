/* The editor's own layouts in the compiled theme: groups and parts the
 * editor looks up by name, the editor layout's geometry across orientation,
 * tool-bar and effect-view signals, and the intensity slider's message. */
#include <Elementary.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ie-config.h"
#include "ie-test-harness.h"

namespace {

const char kTheme[] = RES_DIR "edje/image-editor.edj";

struct GroupParts {
	const char *group;
	std::vector<const char *> parts;
};

const GroupParts kGroups[] = {
	{"iv-editor-view",
	 {"elm.swallow.navibar", "elm.swallow.tabbar", "elm.swallow.ctrlbar", "elm.swallow.content.subview",
	  "elm.swallow.content.effect.subview", "elm.swallow.content.effect.subview.rect",
	  "elm.swallow.effecttray"}},
	{"empty_layout", {}},
	{"iv-funcbar", {"title_left_text_btn", "title_right_text_btn", "elm.text.title"}},
	{"iv-edit-crop", {"elm.swallow.client"}},
	{"iv-effect-slider", {"slider_area"}},
	{"iv-slider-layout", {"effect-name"}},
	{"processing_view_layout", {"elm.text", "processing"}},
	{"elm/naviframe/item/empty/custom/default", {"elm.swallow.content"}},
	{"elm/button/base/naviframe/title_text_left", {"elm.text"}},
	{"elm/button/base/naviframe/title_text_right", {"elm.text"}},
	{"elm/button/base/popup", {"elm.text"}},
	{"elm/progressbar/horizontal/process_medium", {"elm.cur.progressbar"}},
	{"elm/gengrid/item/marlune/iv_view/default", {"elm.swallow.icon"}},
	{"elm/gengrid/item/imageeditor/effectgrid/default", {"elm.swallow.icon", "elm.text.title"}},
};

class ThemeGroups : public iet::EflTest {
protected:
	Evas_Object *layout(const char *group)
	{
		Evas_Object *ly = elm_layout_add(win());
		EXPECT_TRUE(elm_layout_file_set(ly, kTheme, group)) << group;
		evas_object_size_hint_weight_set(ly, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
		elm_win_resize_object_add(win(), ly);
		evas_object_show(ly);
		return ly;
	}
};

TEST_F(ThemeGroups, EveryGroupAndPartTheEditorNamesIsThere)
{
	for (const GroupParts &g : kGroups) {
		ASSERT_TRUE(edje_file_group_exists(kTheme, g.group)) << g.group;
		Evas_Object *edje = edje_object_add(evas());
		ASSERT_TRUE(edje_object_file_set(edje, kTheme, g.group)) << g.group;
		for (const char *part : g.parts)
			EXPECT_TRUE(edje_object_part_exists(edje, part)) << g.group << " lacks " << part;
		evas_object_del(edje);
	}
}

/* Geometry of a part of the editor layout, in canvas coordinates. */
struct Box {
	int x, y, w, h;
};

class EditorLayout : public ThemeGroups {
protected:
	void SetUp() override
	{
		ThemeGroups::SetUp();
		editor = layout("iv-editor-view");
		/* Stand-ins for the bars and the slider overlay, which lets touches
		 * through. */
		for (const char *part : {"elm.swallow.ctrlbar", "elm.swallow.effecttray",
					 "elm.swallow.content.effect.subview"}) {
			Evas_Object *content = evas_object_rectangle_add(evas());
			evas_object_color_set(content, 0, 0, 0, 0);
			elm_object_part_content_set(editor, part, content);
		}
		evas_object_pass_events_set(
			elm_object_part_content_get(editor, "elm.swallow.content.effect.subview"), EINA_TRUE);
		iet::settle();
	}
	void emit(const char *signal)
	{
		elm_object_signal_emit(editor, signal, "elm");
		iet::settle();
	}
	Box part(const char *name)
	{
		Box b{};
		edje_object_part_geometry_get(elm_layout_edje_get(editor), name, &b.x, &b.y, &b.w, &b.h);
		return b;
	}
	/* Whether the content of a swallow part is shown. */
	bool content_shown(const char *swallow)
	{
		const Evas_Object *content = edje_object_part_swallow_get(elm_layout_edje_get(editor), swallow);
		return content && evas_object_visible_get(content);
	}
	bool touch_area_shown()
	{
		const Evas_Object *rect = edje_object_part_object_get(elm_layout_edje_get(editor),
								      "elm.swallow.content.effect.subview.rect");
		return rect && evas_object_visible_get(rect);
	}
	Evas_Object *editor = nullptr;
};

TEST_F(EditorLayout, PortraitPutsTheToolBarAtTheBottomAndTheFunctionBarOnTop)
{
	emit("toolbar,portrait");
	Box tab = part("elm.swallow.tabbar"), ctrl = part("elm.swallow.ctrlbar"), picture = part("elm.swallow.navibar");
	EXPECT_EQ(0, tab.y);
	EXPECT_EQ(720, tab.w);
	EXPECT_EQ(1280, ctrl.y + ctrl.h);
	EXPECT_EQ(720, ctrl.w);
	EXPECT_GE(ctrl.h, 100) << "the tool items are 100 high";
	EXPECT_EQ(tab.y + tab.h, picture.y);
	EXPECT_EQ(ctrl.y, picture.y + picture.h);
	EXPECT_EQ(720, picture.w);
}

TEST_F(EditorLayout, LandscapePutsTheToolBarInAStripOnTheRight)
{
	resize_window(1280, 720);
	emit("toolbar,landscape");
	Box tab = part("elm.swallow.tabbar"), ctrl = part("elm.swallow.ctrlbar"), picture = part("elm.swallow.navibar");
	EXPECT_EQ(1280, ctrl.x + ctrl.w);
	EXPECT_EQ(tab.y + tab.h, ctrl.y);
	EXPECT_EQ(720, ctrl.y + ctrl.h);
	EXPECT_GE(ctrl.w, 100) << "the tool items are 100 wide";
	EXPECT_LT(ctrl.w, 200);
	EXPECT_EQ(ctrl.x, picture.x + picture.w);
	EXPECT_EQ(720, picture.y + picture.h);

	emit("toolbar,portrait");
	EXPECT_EQ(720, part("elm.swallow.ctrlbar").y + part("elm.swallow.ctrlbar").h);
	EXPECT_EQ(1280, part("elm.swallow.ctrlbar").w);
}

TEST_F(EditorLayout, HiddenToolBarGivesItsPlaceToThePictureInEitherOrientation)
{
	emit("toolbar,portrait");
	emit("elm,state,toolbar,hide");
	EXPECT_FALSE(content_shown("elm.swallow.ctrlbar"));
	EXPECT_EQ(1280, part("elm.swallow.navibar").y + part("elm.swallow.navibar").h);
	/* The crop view follows the picture area. */
	Box crop = part("elm.swallow.content.subview"), picture = part("elm.swallow.navibar");
	EXPECT_EQ(picture.y, crop.y);
	EXPECT_EQ(picture.h, crop.h);

	/* A rotation while hidden keeps it hidden. */
	resize_window(1280, 720);
	emit("crop,landscape");
	EXPECT_FALSE(content_shown("elm.swallow.ctrlbar"));
	EXPECT_EQ(1280, part("elm.swallow.navibar").w);

	emit("elm,state,toolbar,show");
	EXPECT_TRUE(content_shown("elm.swallow.ctrlbar"));
	EXPECT_EQ(part("elm.swallow.ctrlbar").x, part("elm.swallow.navibar").x + part("elm.swallow.navibar").w);
}

TEST_F(EditorLayout, EffectViewOpensTheTrayAndTheTouchAreaAndClosesThemAgain)
{
	emit("toolbar,portrait");
	emit("pre,effect,portrait");
	EXPECT_FALSE(content_shown("elm.swallow.effecttray"));
	EXPECT_FALSE(touch_area_shown());
	const int full_height = part("elm.swallow.navibar").h;

	emit("effect,portrait");
	Box tray = part("elm.swallow.effecttray"), ctrl = part("elm.swallow.ctrlbar");
	EXPECT_TRUE(content_shown("elm.swallow.effecttray"));
	EXPECT_GE(tray.h, 124) << "the effect items are 124 high";
	EXPECT_EQ(ctrl.y, tray.y + tray.h);
	EXPECT_EQ(tray.y, part("elm.swallow.navibar").y + part("elm.swallow.navibar").h);
	EXPECT_TRUE(content_shown("elm.swallow.content.effect.subview"));
	EXPECT_TRUE(touch_area_shown());

	resize_window(1280, 720);
	emit("effect,landscape");
	tray = part("elm.swallow.effecttray");
	ctrl = part("elm.swallow.ctrlbar");
	EXPECT_GE(tray.w, 120) << "the effect items are 120 wide";
	EXPECT_EQ(ctrl.x, tray.x + tray.w);
	EXPECT_EQ(tray.x, part("elm.swallow.navibar").x + part("elm.swallow.navibar").w);

	resize_window(720, 1280);
	emit("toolbar,portrait");
	emit("elm,state,effect,view,hide");
	EXPECT_FALSE(content_shown("elm.swallow.effecttray"));
	EXPECT_FALSE(content_shown("elm.swallow.content.effect.subview"));
	EXPECT_FALSE(touch_area_shown());
	EXPECT_EQ(full_height, part("elm.swallow.navibar").h);
}

/* While effects are open, a touch on the picture reaches the touch area
 * and, through it, the picture underneath. */
TEST_F(EditorLayout, TouchAreaSeesTouchesAndPassesThemOn)
{
	Evas_Object *picture = evas_object_rectangle_add(evas());
	evas_object_color_set(picture, 80, 80, 80, 255);
	elm_object_part_content_set(editor, "elm.swallow.navibar", picture);
	int rect_downs = 0, picture_downs = 0;
	auto count = [](void *data, Evas *, Evas_Object *, void *) { ++*static_cast<int *>(data); };
	Evas_Object *rect = const_cast<Evas_Object *>(
		edje_object_part_object_get(elm_layout_edje_get(editor), "elm.swallow.content.effect.subview.rect"));
	ASSERT_NE(nullptr, rect);
	evas_object_event_callback_add(rect, EVAS_CALLBACK_MOUSE_DOWN, count, &rect_downs);
	evas_object_event_callback_add(picture, EVAS_CALLBACK_MOUSE_DOWN, count, &picture_downs);

	emit("toolbar,portrait");
	int x, y;
	iet::object_centre(picture, &x, &y);
	iet::tap(win(), x, y);
	EXPECT_EQ(0, rect_downs) << "the touch area is off outside the effect view";
	EXPECT_EQ(1, picture_downs);

	emit("effect,portrait");
	iet::tap(win(), x, y);
	EXPECT_EQ(1, rect_downs);
	EXPECT_EQ(2, picture_downs);
}

class Slider : public ThemeGroups {
protected:
	void SetUp() override
	{
		ThemeGroups::SetUp();
		slider = layout("iv-slider-layout");
		edje_object_signal_callback_add(elm_layout_edje_get(slider), "*", "slider_value_changed", on_value,
						&reports);
		iet::settle();
	}
	static void on_value(void *data, Evas_Object *, const char *emission, const char *)
	{
		static_cast<std::vector<std::string> *>(data)->push_back(emission);
	}
	void send(int value)
	{
		Edje_Message_Int_Set *msg = static_cast<Edje_Message_Int_Set *>(
			calloc(1, sizeof(Edje_Message_Int_Set) + sizeof(int)));
		msg->count = 1;
		msg->val[0] = value;
		edje_object_message_send(elm_layout_edje_get(slider), EDJE_MESSAGE_INT_SET, 1, msg);
		free(msg);
		edje_object_signal_emit(elm_layout_edje_get(slider), "increase,value", "");
		iet::settle();
	}
	double knob()
	{
		double x = -1;
		edje_object_part_drag_value_get(elm_layout_edje_get(slider), "knob", &x, nullptr);
		return x;
	}
	Evas_Object *slider = nullptr;
	std::vector<std::string> reports;
};

TEST_F(Slider, ReportsEachValueItIsSentAndDrawsIt)
{
	send(37);
	ASSERT_EQ(std::vector<std::string>{"37"}, reports);
	EXPECT_NEAR(0.37, knob(), 0.001);
	send(100);
	send(0);
	EXPECT_EQ((std::vector<std::string>{"37", "100", "0"}), reports);
	EXPECT_NEAR(0.0, knob(), 0.001);
}

/* The value reported is the value shown, so an out-of-range value comes
 * back clamped. */
TEST_F(Slider, OutOfRangeValuesAreClampedAndReportedAsShown)
{
	send(110);
	send(-10);
	EXPECT_EQ((std::vector<std::string>{"100", "0"}), reports);
}

TEST_F(Slider, IgnoresOtherMessages)
{
	Edje_Message_Int_Set *msg =
		static_cast<Edje_Message_Int_Set *>(calloc(1, sizeof(Edje_Message_Int_Set) + sizeof(int)));
	msg->count = 1;
	msg->val[0] = 55;
	edje_object_message_send(elm_layout_edje_get(slider), EDJE_MESSAGE_INT_SET, 2, msg);
	free(msg);
	Edje_Message_Int single = {55};
	edje_object_message_send(elm_layout_edje_get(slider), EDJE_MESSAGE_INT, 1, &single);
	iet::settle();
	EXPECT_TRUE(reports.empty());
}

} // namespace
