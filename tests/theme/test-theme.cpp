/* The compiled theme used through real objects: the groups and parts the
 * editor looks up, the editor layout's signals, the intensity slider's
 * message, and the widget styles it adds to Elementary. */
#include <Elementary.h>
#include <gtest/gtest.h>

#include <set>
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
	{"elm/popup/base/image-editor", {"elm.text.title", "elm.swallow.content", "elm.swallow.action_area"}},
	{"elm/popup/content/popup/image-editor", {"elm.swallow.content"}},
	{"elm/popup/buttons1/popup/image-editor", {"elm.swallow.content.button1"}},
	{"elm/popup/buttons2/popup/image-editor", {"elm.swallow.content.button1", "elm.swallow.content.button2"}},
	{"elm/popup/buttons3/popup/image-editor", {"elm.swallow.content.button3"}},
	{"elm/label/base/popup/image-editor", {"elm.text"}},
	{"elm/notify/bottom/popup/image-editor", {"elm.swallow.content"}},
	{"elm/notify/block_events/popup/image-editor", {"block_events"}},
	{"elm/gengrid/item/marlune/iv_view/default", {"elm.swallow.icon"}},
	{"elm/gengrid/item/imageeditor/effectgrid/default", {"elm.swallow.icon", "elm.text.title"}},
};

class Theme : public iet::EflTest {
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

TEST_F(Theme, EveryGroupAndPartTheEditorNamesIsThere)
{
	for (const GroupParts &g : kGroups) {
		Evas_Object *edje = edje_object_add(evas());
		ASSERT_TRUE(edje_object_file_set(edje, kTheme, g.group)) << g.group;
		for (const char *part : g.parts)
			EXPECT_TRUE(edje_object_part_exists(edje, part)) << g.group << " lacks " << part;
		evas_object_del(edje);
	}
}

void count_event(void *data, Evas_Object *, void *)
{
	++*static_cast<int *>(data);
}

TEST_F(Theme, EveryButtonStyleClicksOnATapAndNotWhenDisabled)
{
	for (const char *style : {"naviframe/title_text_left", "naviframe/title_text_right", "popup"}) {
		SCOPED_TRACE(style);
		Evas_Object *button = elm_button_add(win());
		ASSERT_TRUE(elm_object_style_set(button, style));
		elm_object_text_set(button, "Done");
		int clicked = 0;
		evas_object_smart_callback_add(button, "clicked", count_event, &clicked);
		evas_object_resize(button, 200, 80);
		evas_object_move(button, 100, 200);
		evas_object_show(button);
		iet::tap_object(button);
		iet::settle();
		EXPECT_EQ(1, clicked);

		/* Pressed inside, released outside: no click. */
		int x, y;
		iet::object_centre(button, &x, &y);
		iet::mouse_down(win(), x, y);
		iet::mouse_move(win(), x + 400, y + 400);
		iet::mouse_up(win(), x + 400, y + 400);
		elm_object_disabled_set(button, EINA_TRUE);
		iet::tap_object(button);
		iet::settle();
		EXPECT_EQ(1, clicked);
		evas_object_del(button);
		iet::settle();
	}
}

TEST_F(Theme, BusyIndicatorKeepsMoving)
{
	Evas_Object *bar = elm_progressbar_add(win());
	ASSERT_TRUE(elm_object_style_set(bar, "process_medium"));
	elm_progressbar_pulse_set(bar, EINA_TRUE);
	elm_progressbar_pulse(bar, EINA_TRUE);
	evas_object_resize(bar, 400, 40);
	evas_object_show(bar);
	/* Uneven sampling times, so a to-and-fro sweep cannot look still. */
	std::set<int> positions;
	for (double wait : {0.0, 0.13, 0.29, 0.17}) {
		iet::run_for(wait);
		iet::settle();
		int x = 0;
		edje_object_part_geometry_get(elm_layout_edje_get(bar), "pulse", &x, nullptr, nullptr, nullptr);
		positions.insert(x);
	}
	EXPECT_GE(positions.size(), 3u);
}

class EditorLayout : public Theme {
protected:
	void SetUp() override
	{
		Theme::SetUp();
		editor = layout("iv-editor-view");
		for (const char *part : {"elm.swallow.navibar", "elm.swallow.ctrlbar", "elm.swallow.effecttray",
					 "elm.swallow.content.effect.subview"})
			elm_object_part_content_set(editor, part, evas_object_rectangle_add(evas()));
		/* The slider overlay lets touches through to the picture. */
		evas_object_pass_events_set(
			elm_object_part_content_get(editor, "elm.swallow.content.effect.subview"), EINA_TRUE);
		emit("toolbar,portrait");
	}
	void emit(const char *signal)
	{
		elm_object_signal_emit(editor, signal, "elm");
		iet::settle();
	}
	bool shown(const char *swallow)
	{
		return evas_object_visible_get(elm_object_part_content_get(editor, swallow));
	}
	Evas_Object *editor = nullptr;
};

TEST_F(EditorLayout, ToolBarAndEffectTrayFollowTheirSignals)
{
	emit("elm,state,toolbar,hide");
	EXPECT_FALSE(shown("elm.swallow.ctrlbar"));
	/* A rotation while hidden keeps it hidden. */
	resize_window(1280, 720);
	emit("crop,landscape");
	EXPECT_FALSE(shown("elm.swallow.ctrlbar"));
	emit("elm,state,toolbar,show");
	EXPECT_TRUE(shown("elm.swallow.ctrlbar"));

	EXPECT_FALSE(shown("elm.swallow.effecttray"));
	emit("effect,landscape");
	EXPECT_TRUE(shown("elm.swallow.effecttray"));
	EXPECT_TRUE(shown("elm.swallow.content.effect.subview"));
	emit("elm,state,effect,view,hide");
	EXPECT_FALSE(shown("elm.swallow.effecttray"));
	EXPECT_FALSE(shown("elm.swallow.content.effect.subview"));
}

/* While effects are open, a touch on the picture reaches the touch area
 * and, through it, the picture underneath. */
TEST_F(EditorLayout, TouchAreaSeesTouchesOnlyWhileTheEffectViewIsOpen)
{
	Evas_Object *picture = elm_object_part_content_get(editor, "elm.swallow.navibar");
	auto *rect = const_cast<Evas_Object *>(
		edje_object_part_object_get(elm_layout_edje_get(editor), "elm.swallow.content.effect.subview.rect"));
	ASSERT_NE(nullptr, rect);
	int rect_downs = 0, picture_downs = 0;
	auto count = [](void *data, Evas *, Evas_Object *, void *) { ++*static_cast<int *>(data); };
	evas_object_event_callback_add(rect, EVAS_CALLBACK_MOUSE_DOWN, count, &rect_downs);
	evas_object_event_callback_add(picture, EVAS_CALLBACK_MOUSE_DOWN, count, &picture_downs);
	int x, y;
	iet::object_centre(picture, &x, &y);

	iet::tap(win(), x, y);
	EXPECT_EQ(0, rect_downs);
	emit("effect,portrait");
	iet::tap(win(), x, y);
	EXPECT_EQ(1, rect_downs);
	emit("elm,state,effect,view,hide");
	iet::tap(win(), x, y);
	EXPECT_EQ(1, rect_downs);
	EXPECT_EQ(3, picture_downs);
}

class Slider : public Theme {
protected:
	void SetUp() override
	{
		Theme::SetUp();
		slider = elm_layout_edje_get(layout("iv-slider-layout"));
		edje_object_signal_callback_add(slider, "*", "slider_value_changed", on_value, &reports);
		iet::settle();
	}
	static void on_value(void *data, Evas_Object *, const char *emission, const char *)
	{
		static_cast<std::vector<std::string> *>(data)->push_back(emission);
	}
	void send(int value, int id = 1)
	{
		auto *msg = static_cast<Edje_Message_Int_Set *>(calloc(1, sizeof(Edje_Message_Int_Set) + sizeof(int)));
		msg->count = 1;
		msg->val[0] = value;
		edje_object_message_send(slider, EDJE_MESSAGE_INT_SET, id, msg);
		free(msg);
		edje_object_signal_emit(slider, "increase,value", "");
		iet::settle();
	}
	Evas_Object *slider = nullptr;
	std::vector<std::string> reports;
};

/* The value reported is the value shown, so out-of-range values come back
 * clamped; other messages are not the slider's. */
TEST_F(Slider, ReportsAndDrawsEachValueClamped)
{
	send(37);
	double knob = -1;
	edje_object_part_drag_value_get(slider, "knob", &knob, nullptr);
	EXPECT_NEAR(0.37, knob, 0.001);
	send(100);
	send(0);
	send(110);
	send(-10);
	send(55, 2);
	Edje_Message_Int single = {55};
	edje_object_message_send(slider, EDJE_MESSAGE_INT, 1, &single);
	iet::settle();
	EXPECT_EQ((std::vector<std::string>{"37", "100", "0", "100", "0"}), reports);
}

} // namespace
