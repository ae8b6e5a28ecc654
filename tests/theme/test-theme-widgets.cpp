/* The widget styles the theme adds to Elementary, used through the real
 * widgets: buttons clicked by taps, the effect and tool items of a gengrid,
 * the content-only naviframe item and the busy indicator. */
#include <Elementary.h>
#include <gtest/gtest.h>

#include <cstring>
#include <set>
#include <string>

#include "ie-config.h"
#include "ie-test-harness.h"

namespace {

class ThemeWidgets : public iet::EflTest {
protected:
	/* Shows a widget at a fixed place and size and lays it out. */
	void place(Evas_Object *obj, int w, int h)
	{
		evas_object_resize(obj, w, h);
		evas_object_move(obj, 100, 200);
		evas_object_show(obj);
		iet::settle();
	}
};

struct ButtonCounts {
	int clicked = 0, pressed = 0, unpressed = 0;
};

void count_event(void *data, Evas_Object *, void *)
{
	++*static_cast<int *>(data);
}

TEST_F(ThemeWidgets, EveryButtonStyleClicksOnATapAndNotWhenDisabled)
{
	for (const char *style : {"naviframe/title_text_left", "naviframe/title_text_right", "popup"}) {
		SCOPED_TRACE(style);
		Evas_Object *button = elm_button_add(win());
		ASSERT_TRUE(elm_object_style_set(button, style));
		elm_object_text_set(button, "Done");
		ButtonCounts counts;
		evas_object_smart_callback_add(button, "clicked", count_event, &counts.clicked);
		evas_object_smart_callback_add(button, "pressed", count_event, &counts.pressed);
		evas_object_smart_callback_add(button, "unpressed", count_event, &counts.unpressed);
		place(button, 200, 80);

		Evas_Coord min_w = 0, min_h = 0;
		evas_object_size_hint_min_get(button, &min_w, &min_h);
		EXPECT_GT(min_w, 0) << "the text gives the button its size";
		EXPECT_GT(min_h, 0);

		iet::tap_object(button);
		iet::settle();
		EXPECT_EQ(1, counts.clicked);
		EXPECT_EQ(1, counts.pressed);
		EXPECT_EQ(1, counts.unpressed);

		/* Pressed inside, released outside: no click. */
		int x, y;
		iet::object_centre(button, &x, &y);
		iet::mouse_move(win(), x, y);
		iet::mouse_down(win(), x, y);
		iet::mouse_move(win(), x + 400, y + 400);
		iet::mouse_up(win(), x + 400, y + 400);
		iet::settle();
		EXPECT_EQ(1, counts.clicked);

		elm_object_disabled_set(button, EINA_TRUE);
		iet::settle();
		iet::tap_object(button);
		iet::settle();
		EXPECT_EQ(1, counts.clicked);

		elm_object_disabled_set(button, EINA_FALSE);
		iet::settle();
		iet::tap_object(button);
		iet::settle();
		EXPECT_EQ(2, counts.clicked);
		evas_object_del(button);
		iet::settle();
	}
}

Evas_Object *rect_content(void *, Evas_Object *obj, const char *part)
{
	if (strcmp(part, "elm.swallow.icon"))
		return nullptr;
	Evas_Object *rect = evas_object_rectangle_add(evas_object_evas_get(obj));
	evas_object_color_set(rect, 200, 100, 50, 255);
	return rect;
}

char *title_text(void *, Evas_Object *, const char *part)
{
	return strcmp(part, "elm.text.title") ? nullptr : strdup("Sepia");
}

Evas_Object *add_grid(Evas_Object *parent, const char *style, int item_w, int item_h, Elm_Object_Item **item)
{
	Evas_Object *grid = elm_gengrid_add(parent);
	elm_gengrid_item_size_set(grid, item_w, item_h);
	elm_gengrid_horizontal_set(grid, EINA_TRUE);
	Elm_Gengrid_Item_Class *itc = elm_gengrid_item_class_new();
	itc->item_style = style;
	itc->func.content_get = rect_content;
	itc->func.text_get = title_text;
	*item = elm_gengrid_item_append(grid, itc, nullptr, nullptr, nullptr);
	elm_gengrid_item_class_free(itc);
	return grid;
}

/* The thumbnail is sized and cropped by its own fill, so the item must
 * give it exactly 118 x 118. */
TEST_F(ThemeWidgets, EffectItemHoldsASquareThumbnailAndItsName)
{
	Elm_Object_Item *item = nullptr;
	Evas_Object *grid = add_grid(win(), "imageeditor/effectgrid", 120, 124, &item);
	place(grid, 600, 144);
	iet::run_idlers();
	iet::settle();

	Evas_Object *thumb = elm_object_item_part_content_get(item, "elm.swallow.icon");
	ASSERT_NE(nullptr, thumb);
	int x, y, w, h;
	evas_object_geometry_get(thumb, &x, &y, &w, &h);
	EXPECT_EQ(118, w);
	EXPECT_EQ(118, h);
	EXPECT_TRUE(evas_object_visible_get(thumb));

	Evas_Object *view = elm_object_item_track(item);
	ASSERT_NE(nullptr, view);
	int vx, vy, vw, vh;
	evas_object_geometry_get(view, &vx, &vy, &vw, &vh);
	EXPECT_GE(x, vx);
	EXPECT_LE(x + w, vx + vw);
	EXPECT_GE(y, vy);
	EXPECT_LE(y + h, vy + vh);
	elm_object_item_untrack(item);

	const char *title = elm_object_item_part_text_get(item, "elm.text.title");
	EXPECT_STREQ("Sepia", title ? title : "");

	for (const char *signal : {"select", "pressed,item", "released,item", "activated", "unselect"})
		elm_object_item_signal_emit(item, signal, "elm");
	iet::settle();
}

TEST_F(ThemeWidgets, ToolItemHoldsItsIconInsideTheItem)
{
	Elm_Object_Item *item = nullptr;
	Evas_Object *grid = add_grid(win(), "marlune/iv_view", 120, 100, &item);
	place(grid, 600, 120);
	iet::run_idlers();
	iet::settle();

	Evas_Object *icon = elm_object_item_part_content_get(item, "elm.swallow.icon");
	ASSERT_NE(nullptr, icon);
	int x, y, w, h;
	evas_object_geometry_get(icon, &x, &y, &w, &h);
	EXPECT_GT(w, 0);
	EXPECT_GT(h, 0);
	EXPECT_LE(w, 100);
	EXPECT_LE(h, 100);
	for (const char *signal : {"select", "pressed,toolbar,item", "released,toolbar,item", "unselect"})
		elm_object_item_signal_emit(item, signal, "elm");
	iet::settle();
}

TEST_F(ThemeWidgets, EmptyCustomNaviframeItemShowsOnlyItsContent)
{
	Evas_Object *naviframe = elm_naviframe_add(win());
	Evas_Object *content = evas_object_rectangle_add(evas());
	Elm_Object_Item *item = elm_naviframe_item_push(naviframe, nullptr, nullptr, nullptr, content, "empty/custom");
	ASSERT_NE(nullptr, item);
	elm_naviframe_item_title_enabled_set(item, EINA_FALSE, EINA_FALSE);
	place(naviframe, 500, 600);
	iet::run_idlers();
	iet::settle();

	int x, y, w, h;
	evas_object_geometry_get(content, &x, &y, &w, &h);
	EXPECT_EQ(100, x);
	EXPECT_EQ(200, y);
	EXPECT_EQ(500, w);
	EXPECT_EQ(600, h);
	EXPECT_TRUE(evas_object_visible_get(content));
}

TEST_F(ThemeWidgets, BusyIndicatorKeepsMoving)
{
	Evas_Object *bar = elm_progressbar_add(win());
	ASSERT_TRUE(elm_object_style_set(bar, "process_medium"));
	elm_progressbar_pulse_set(bar, EINA_TRUE);
	elm_progressbar_pulse(bar, EINA_TRUE);
	place(bar, 400, 40);

	/* Sampled at uneven times so that a to-and-fro sweep cannot look still. */
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

} // namespace
