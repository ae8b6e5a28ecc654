/* Feature-usage entries: fire and forget, never in the editor's way. */
#include <vantric_log_manager.h>

#include "editor-fixture.h"

namespace {

using UsageLog = EditorTest;

TEST_F(UsageLog, EachEditorSendsOneEditEntry)
{
	ASSERT_NE(create_editor(), nullptr);
	EXPECT_EQ(vantric_log_manager_count_entries("feature", "EDIT"), 1);
	EXPECT_EQ(vantric_log_manager_count_entries("app_id", IE_HOST_PKGID), 1);
	destroy_editor();
	ASSERT_NE(create_editor(), nullptr);
	EXPECT_EQ(vantric_log_manager_count_entries("feature", "EDIT"), 2);
}

TEST_F(UsageLog, EachCropViewOpeningSendsACropEntry)
{
	ASSERT_NE(open_editor_on_picture(40, 30), nullptr);
	for (int i = 0; i < 3; i++) {
		ie_view_mgr_set_view(IE_VIEW_TYPE_CROP, vh);
		ie_view_mgr_set_view(IE_VIEW_TYPE_MAIN, vh);
	}
	EXPECT_EQ(vantric_log_manager_count_entries("feature", "CROP"), 3);
}

TEST_F(UsageLog, AFailingClientLeavesTheEditorWorking)
{
	vantric_log_manager_fail_create(1);
	iet::log_clear();
	ASSERT_NE(open_editor_on_picture(40, 30), nullptr);
	EXPECT_EQ(vh->log_handle, nullptr);
	int failures = 0;
	for (const auto &message : iet::log_messages())
		failures += message.rfind("vantric_log_manager_create failed, err=", 0) == 0;
	EXPECT_GE(failures, 1);
	ie_view_mgr_set_view(IE_VIEW_TYPE_ROTATE_RIGHT, vh);
	int w, h;
	picture_size(&w, &h);
	EXPECT_EQ(w, 30);
	vantric_log_manager_fail_create(0);
	EXPECT_EQ(vantric_log_manager_count_entries("feature", "EDIT"), 0);
}

TEST_F(UsageLog, DestroyWithoutAHandleCallsNoClientFunction)
{
	vantric_log_manager_fail_create(1);
	ASSERT_NE(create_editor(), nullptr);
	vantric_log_manager_fail_create(0);
	int calls = vantric_log_manager_call_count();
	destroy_editor();
	EXPECT_EQ(vantric_log_manager_call_count(), calls);
}

} // namespace
