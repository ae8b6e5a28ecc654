/* The function bar and the tool bar, driven by taps on their real items. */
#include <dlfcn.h>

#include "editor-fixture.h"
#include "ie-image.h"

/* Makes the toolbar's item class fail to be created, as when memory runs
 * out: the editor's own call resolves to this definition first. */
static bool item_class_refused;

extern "C" Elm_Gengrid_Item_Class *elm_gengrid_item_class_new(void)
{
	if (item_class_refused)
		return nullptr;
	using Real = Elm_Gengrid_Item_Class *(*)(void);
	static Real real = reinterpret_cast<Real>(dlsym(RTLD_NEXT, "elm_gengrid_item_class_new"));
	return real();
}

namespace {

class Bars : public EditorTest {
protected:
	/* Whether the item's theme shows it selected: its icon sits in the
	 * item's own Edje object. */
	bool tool_shown_selected(int index)
	{
		Evas_Object *icon = elm_object_item_part_content_get(tool(index), "elm.swallow.icon");
		Evas_Object *view = icon ? evas_object_smart_parent_get(icon) : nullptr;
		double value;
		const char *state = view ? edje_object_part_state_get(view, "indicator", &value) : nullptr;
		return state && !strcmp(state, "selected");
	}
};

TEST_F(Bars, ToolPicksReachTheViewManager)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	tap_tool(3);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_EFFECT);
	tap_tool(2);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_ROTATE_RIGHT);
	tap_tool(1);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_ROTATE_LEFT);
	vh->edited = EINA_TRUE;
	tap_tool(0);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_CROP);
	EXPECT_TRUE(tool_shown_selected(0)) << "crop stays selected while its view is open";
	EXPECT_FALSE(vh->edited) << "crop starts from a clean slate";
	EXPECT_EQ(vh->width, win_w);
	EXPECT_EQ(vh->height, win_h);
}

TEST_F(Bars, RotateLeftThreeTimesTurnsThreeTimes)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	auto start = picture_pixels();
	for (int i = 0; i < 3; i++) {
		tap_tool(1);
		EXPECT_FALSE(tool_shown_selected(1)) << "a rotation leaves its tool unselected, tap " << i;
	}
	int w, h;
	picture_size(&w, &h);
	EXPECT_EQ(w, 48);
	EXPECT_EQ(h, 64);
	tap_tool(1);
	EXPECT_EQ(picture_pixels(), start) << "a fourth turn restores the picture";
}

TEST_F(Bars, ToolBarFollowsTheWindowRotation)
{
	for (int rotation : {0, 90, 180, 270}) {
		elm_win_rotation_set(win(), rotation);
		ASSERT_NE(create_editor(), nullptr);
		bool portrait = rotation % 180 == 0;
		EXPECT_EQ(vh->win_rotation, rotation);
		EXPECT_EQ(elm_gengrid_horizontal_get(vh->toolbar), portrait) << rotation;
		Evas_Coord w, h;
		elm_gengrid_item_size_get(vh->toolbar, &w, &h);
		EXPECT_EQ(w, portrait ? 120 : 100) << rotation;
		EXPECT_EQ(h, portrait ? 100 : 102) << rotation;
		destroy_editor();
	}
}

TEST_F(Bars, LayoutResizeFollowsTheWindowRotation)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	elm_win_rotation_set(win(), 270);
	resize_window(1280, 720);
	EXPECT_FALSE(elm_gengrid_horizontal_get(vh->toolbar));
	EXPECT_EQ(vh->width, 1280);
	EXPECT_EQ(vh->height, 720);
}

TEST_F(Bars, ToolBarWithoutItemClassLeavesAWorkingEditor)
{
	item_class_refused = true;
	iet::log_clear();
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	item_class_refused = false;
	EXPECT_EQ(iet::log_count("the toolbar item class was not created", PLATFORM_LOG_ERROR), 1);
	EXPECT_EQ(elm_gengrid_items_count(vh->toolbar), 0u);
	EXPECT_EQ(vh->toolbar_itc, nullptr);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_MAIN);
	int w, h;
	picture_size(&w, &h);
	EXPECT_EQ(w, 64);
}

} // namespace
