#include <vantric_log_manager.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <string>

#include "ie-test-harness.h"

namespace {

constexpr char uri[] = "content://org.marlune.log/log/use_app_feature_survey";

class VantricLog : public iet::EflTest {
protected:
	void SetUp() override
	{
		iet::EflTest::SetUp();
		setenv("VANTRIC_LOG_DB", (iet::temp_dir() + "/dbspace/.vantric-log.db").c_str(), 1);
		vantric_log_manager_fail_create(0);
	}

	int insert(vantric_log_manager_h handle, const char *feature, vantric_log_reply_cb callback = nullptr,
		   void *user_data = nullptr, int *request_id = nullptr)
	{
		bundle *entry = bundle_create();
		bundle_add(entry, "app_id", "org.marlune.gallery");
		bundle_add(entry, "feature", feature);
		int result = vantric_log_manager_insert(handle, uri, entry, callback, user_data, request_id);
		bundle_free(entry);
		return result;
	}
};

struct Reply {
	int calls = 0;
	int request_id = 0;
	int result = -1;
};

void on_reply(int request_id, int result, void *data)
{
	auto *reply = static_cast<Reply *>(data);
	reply->calls++;
	reply->request_id = request_id;
	reply->result = result;
}

} // namespace

TEST_F(VantricLog, StoresEntriesInTheDatabase)
{
	vantric_log_manager_h handle = nullptr;
	ASSERT_EQ(vantric_log_manager_create(&handle), VANTRIC_LOG_ERROR_NONE);
	ASSERT_NE(handle, nullptr);

	EXPECT_EQ(insert(handle, "EDIT"), VANTRIC_LOG_ERROR_NONE);
	Reply reply;
	int request_id = 0;
	EXPECT_EQ(insert(handle, "CROP", on_reply, &reply, &request_id), VANTRIC_LOG_ERROR_NONE);
	EXPECT_EQ(insert(handle, "CROP"), VANTRIC_LOG_ERROR_NONE);
	EXPECT_EQ(reply.calls, 1);
	EXPECT_EQ(reply.result, VANTRIC_LOG_ERROR_NONE);
	EXPECT_NE(request_id, 0);
	EXPECT_EQ(reply.request_id, request_id);
	EXPECT_EQ(vantric_log_manager_destroy(handle), VANTRIC_LOG_ERROR_NONE);

	EXPECT_EQ(vantric_log_manager_count_entries("feature", "EDIT"), 1);
	EXPECT_EQ(vantric_log_manager_count_entries("feature", "CROP"), 2);
	EXPECT_EQ(vantric_log_manager_count_entries("app_id", "org.marlune.gallery"), 3);
	EXPECT_EQ(vantric_log_manager_count_entries("feature", "ROTATE"), 0);
}

TEST_F(VantricLog, FailingCreateGivesNoHandleAndCallsAreCounted)
{
	int before = vantric_log_manager_call_count();
	vantric_log_manager_fail_create(1);
	vantric_log_manager_h handle = reinterpret_cast<vantric_log_manager_h>(this);
	EXPECT_NE(vantric_log_manager_create(&handle), VANTRIC_LOG_ERROR_NONE);
	EXPECT_EQ(handle, nullptr);
	EXPECT_EQ(insert(nullptr, "EDIT"), VANTRIC_LOG_ERROR_INVALID_PARAMETER);
	EXPECT_EQ(vantric_log_manager_destroy(nullptr), VANTRIC_LOG_ERROR_INVALID_PARAMETER);
	EXPECT_EQ(vantric_log_manager_call_count(), before + 3);
	EXPECT_EQ(vantric_log_manager_count_entries("feature", "EDIT"), 0);
}

TEST_F(VantricLog, UnwritableDatabaseFailsCreate)
{
	// The database's directory cannot be made below a plain file.
	std::string file = iet::temp_dir() + "/plain-file";
	fclose(fopen(file.c_str(), "w"));
	setenv("VANTRIC_LOG_DB", (file + "/log.db").c_str(), 1);
	vantric_log_manager_h handle = nullptr;
	EXPECT_EQ(vantric_log_manager_create(&handle), VANTRIC_LOG_ERROR_IO);
	EXPECT_EQ(handle, nullptr);
}
