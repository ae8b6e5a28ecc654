#include <storage_space.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <string>

#include "ie-test-harness.h"

// The fixture removes the scratch directories afterwards.
class Storage : public iet::EflTest {};

TEST_F(Storage, MeasuresTheInternalRootAndReportsAMissingOne)
{
	std::string root = iet::temp_dir();
	setenv("STORAGE_INTERNAL_ROOT", root.c_str(), 1);
	struct statvfs expected = {}, measured = {};
	ASSERT_EQ(statvfs(root.c_str(), &expected), 0);
	ASSERT_EQ(storage_get_internal_memory_size(&measured), STORAGE_SPACE_ERROR_NONE);
	EXPECT_EQ(measured.f_fsid, expected.f_fsid);
	EXPECT_EQ(measured.f_blocks, expected.f_blocks);

	// A missing root is a failure, not an empty disk.
	setenv("STORAGE_INTERNAL_ROOT", (root + "/absent").c_str(), 1);
	EXPECT_EQ(storage_get_internal_memory_size(&measured), STORAGE_SPACE_ERROR_OPERATION_FAILED);
}
