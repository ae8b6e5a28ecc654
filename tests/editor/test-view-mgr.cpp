/* View switching. The current view belongs to the process: CTest runs each
 * test in a process of its own, so every test starts from no view. */
#include "editor-fixture.h"

namespace {

class ViewManager : public EditorTest {
protected:
	void SetUp() override
	{
		EditorTest::SetUp();
		if (ie_view_mgr_get_current_view() != IE_VIEW_TYPE_UNDEF)
			GTEST_SKIP() << "needs a process of its own (run it through ctest)";
	}
};

TEST_F(ViewManager, FirstTransitionLeavesTheUndefinedView)
{
	ASSERT_NE(create_editor(), nullptr);
	iet::log_clear();
	EXPECT_TRUE(ie_view_mgr_set_view(IE_VIEW_TYPE_MAIN, vh));
	EXPECT_EQ(iet::log_count("Current mode is undef", PLATFORM_LOG_INFO), 1);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_MAIN);
}

TEST_F(ViewManager, SameViewDoesNothingButRotationsRepeat)
{
	ASSERT_NE(open_editor_on_picture(40, 30), nullptr);
	ASSERT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_MAIN);

	/* Entering the main view would delete the effect layout. */
	Evas_Object *marker = evas_object_rectangle_add(evas());
	vh->effect_layout = marker;
	iet::log_clear();
	EXPECT_TRUE(ie_view_mgr_set_view(IE_VIEW_TYPE_MAIN, vh));
	EXPECT_EQ(iet::log_count("Same View transition. IE_VIEW_TYPE_MAIN", PLATFORM_LOG_INFO), 1);
	EXPECT_EQ(vh->effect_layout, marker);
	vh->effect_layout = nullptr;
	evas_object_del(marker);

	int w, h;
	ie_view_mgr_set_view(IE_VIEW_TYPE_ROTATE_LEFT, vh);
	picture_size(&w, &h);
	EXPECT_EQ(w, 30);
	ie_view_mgr_set_view(IE_VIEW_TYPE_ROTATE_LEFT, vh);
	picture_size(&w, &h);
	EXPECT_EQ(w, 40) << "the second request turns the picture again";
	EXPECT_EQ(iet::log_count("Same View transition. IE_VIEW_TYPE_ROTATE_LEFT"), 0);
}

TEST_F(ViewManager, LeavingTheEffectViewClosesItBeforeTheCropViewOpens)
{
	ASSERT_NE(open_editor_on_picture(40, 30), nullptr);
	ie_view_mgr_set_view(IE_VIEW_TYPE_EFFECT, vh);
	iet::log_clear();
	ie_view_mgr_set_view(IE_VIEW_TYPE_CROP, vh);
	EXPECT_EQ(iet::log_count("ie_delete_effect_view", PLATFORM_LOG_INFO), 1);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_CROP);
	EXPECT_NE(vh->crop_layout, nullptr);
	ie_view_mgr_set_view(IE_VIEW_TYPE_MAIN, vh);
	EXPECT_EQ(vh->crop_layout, nullptr);
}

TEST_F(ViewManager, UnknownViewsAreLoggedAndStillBecomeCurrent)
{
	ASSERT_NE(create_editor(), nullptr);
	iet::log_clear();
	EXPECT_TRUE(ie_view_mgr_set_view(IE_VIEW_TYPE_SAVE, vh));
	EXPECT_EQ(iet::log_count("Unhandled View : IE_VIEW_TYPE_SAVE", PLATFORM_LOG_ERROR), 1);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_SAVE);
	iet::log_clear();
	ie_view_mgr_set_view(42, vh);
	EXPECT_EQ(iet::log_count("Unhandled View : IE_VIEW_TYPE_SAVE", PLATFORM_LOG_INFO), 1);
	EXPECT_EQ(iet::log_count("Unhandled View : IE_VIEW_TYPE_UNKNOWN", PLATFORM_LOG_ERROR), 1);
}

TEST_F(ViewManager, ASecondEditorStartsFromTheLastView)
{
	ASSERT_NE(open_editor_on_picture(40, 30), nullptr);
	destroy_editor();
	iet::log_clear();
	ASSERT_NE(open_editor_on_picture(40, 30), nullptr);
	EXPECT_EQ(iet::log_count("Same View transition. IE_VIEW_TYPE_MAIN", PLATFORM_LOG_INFO), 1);
}

TEST_F(ViewManager, DestroyClosesAnOpenCropView)
{
	ASSERT_NE(open_editor_on_picture(40, 30), nullptr);
	ie_view_mgr_set_view(IE_VIEW_TYPE_CROP, vh);
	ASSERT_NE(vh->crop_layout, nullptr);
	destroy_editor();
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_MAIN);
}

} // namespace
