#include <bundle.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace {

struct BundleDeleter {
	void operator()(bundle *b) const { bundle_free(b); }
};
using Bundle = std::unique_ptr<bundle, BundleDeleter>;

void collect(const char *key, const char *val, void *data)
{
	static_cast<std::vector<std::pair<std::string, std::string>> *>(data)->emplace_back(key, val);
}

} // namespace

TEST(Bundle, KeepsPairsInOrderAndRefusesRepeatedKeys)
{
	Bundle b(bundle_create());
	ASSERT_TRUE(b);
	EXPECT_EQ(bundle_add(b.get(), "app_id", "org.marlune.gallery"), BUNDLE_ERROR_NONE);
	EXPECT_EQ(bundle_add_str(b.get(), "feature", "EDIT"), BUNDLE_ERROR_NONE);
	EXPECT_EQ(bundle_add(b.get(), "feature", "CROP"), BUNDLE_ERROR_KEY_EXISTS);
	EXPECT_EQ(bundle_add(b.get(), "empty", ""), BUNDLE_ERROR_NONE);
	EXPECT_EQ(bundle_add(b.get(), "absent", nullptr), BUNDLE_ERROR_INVALID_PARAMETER);
	EXPECT_EQ(bundle_get_count(b.get()), 3);

	EXPECT_STREQ(bundle_get_val(b.get(), "feature"), "EDIT");
	EXPECT_STREQ(bundle_get_val(b.get(), "empty"), "");
	EXPECT_EQ(bundle_get_val(b.get(), "missing"), nullptr);
	char *text = nullptr;
	EXPECT_EQ(bundle_get_str(b.get(), "app_id", &text), BUNDLE_ERROR_NONE);
	EXPECT_STREQ(text, "org.marlune.gallery");
	EXPECT_EQ(bundle_get_str(b.get(), "missing", &text), BUNDLE_ERROR_KEY_NOT_AVAILABLE);

	std::vector<std::pair<std::string, std::string>> seen;
	bundle_iterate(b.get(), collect, &seen);
	std::vector<std::pair<std::string, std::string>> expected = {
		{"app_id", "org.marlune.gallery"}, {"feature", "EDIT"}, {"empty", ""}};
	EXPECT_EQ(seen, expected);
}
