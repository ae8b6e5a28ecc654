#include <kv_bundle.h>
#include <vantric_log_manager.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <string>
#include <utility>
#include <vector>

#include "ie-test-harness.h"

namespace {

constexpr char uri[] = "content://org.marlune.log/log/use_app_feature_survey";

using Pairs = std::vector<std::pair<std::string, std::string>>;

void collect(const char *key, const char *val, void *data)
{
	static_cast<Pairs *>(data)->emplace_back(key, val);
}

class VantricLog : public iet::EflTest {
protected:
	void SetUp() override
	{
		iet::EflTest::SetUp();
		setenv("VANTRIC_LOG_DB", (iet::temp_dir() + "/db/usage-log.db").c_str(), 1);
		vantric_log_manager_fail_create(0);
	}

	int insert(vantric_log_manager_h handle, const char *feature, int *request_id = nullptr)
	{
		Kv_Bundle *entry = bundle_create();
		bundle_add(entry, "app_id", "org.marlune.gallery");
		bundle_add(entry, "feature", feature);
		int result = vantric_log_manager_insert(handle, uri, entry, nullptr, nullptr, request_id);
		bundle_free(entry);
		return result;
	}
};

} // namespace

// Log entries are bundles: their pairs are the entry's columns, in order.
TEST(Bundle, KeepsPairsInOrderAndRefusesRepeatedOrMissingValues)
{
	Kv_Bundle *b = bundle_create();
	ASSERT_NE(b, nullptr);
	EXPECT_EQ(bundle_add(b, "app_id", "org.marlune.gallery"), KV_BUNDLE_ERROR_NONE);
	EXPECT_EQ(bundle_add_string(b, "feature", "EDIT"), KV_BUNDLE_ERROR_NONE);
	EXPECT_EQ(bundle_add(b, "feature", "CROP"), KV_BUNDLE_ERROR_KEY_EXISTS);
	EXPECT_EQ(bundle_add(b, "empty", ""), KV_BUNDLE_ERROR_NONE);
	EXPECT_EQ(bundle_add(b, "absent", nullptr), KV_BUNDLE_ERROR_INVALID_PARAMETER);
	EXPECT_EQ(bundle_size(b), 3);
	EXPECT_STREQ(bundle_lookup(b, "feature"), "EDIT");
	EXPECT_EQ(bundle_lookup(b, "missing"), nullptr);
	Pairs seen;
	bundle_foreach(b, collect, &seen);
	EXPECT_EQ(seen, (Pairs{{"app_id", "org.marlune.gallery"}, {"feature", "EDIT"}, {"empty", ""}}));
	bundle_free(b);
}

TEST_F(VantricLog, StoresEntriesInTheDatabase)
{
	vantric_log_manager_h handle = nullptr;
	ASSERT_EQ(vantric_log_manager_create(&handle), VANTRIC_LOG_ERROR_NONE);
	EXPECT_EQ(insert(handle, "EDIT"), VANTRIC_LOG_ERROR_NONE);
	int request_id = 0;
	EXPECT_EQ(insert(handle, "CROP", &request_id), VANTRIC_LOG_ERROR_NONE);
	EXPECT_NE(request_id, 0);
	EXPECT_EQ(insert(handle, "CROP"), VANTRIC_LOG_ERROR_NONE);
	EXPECT_EQ(vantric_log_manager_destroy(handle), VANTRIC_LOG_ERROR_NONE);

	EXPECT_EQ(vantric_log_manager_count_entries("feature", "EDIT"), 1);
	EXPECT_EQ(vantric_log_manager_count_entries("feature", "CROP"), 2);
	EXPECT_EQ(vantric_log_manager_count_entries("app_id", "org.marlune.gallery"), 3);
}

TEST_F(VantricLog, FailedCreateGivesNoHandleAndStoresNothing)
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

	// A database that cannot be made, its directory being a plain file.
	vantric_log_manager_fail_create(0);
	std::string file = iet::temp_dir() + "/plain-file";
	fclose(fopen(file.c_str(), "w"));
	setenv("VANTRIC_LOG_DB", (file + "/log.db").c_str(), 1);
	EXPECT_EQ(vantric_log_manager_create(&handle), VANTRIC_LOG_ERROR_IO);
	EXPECT_EQ(handle, nullptr);
}
