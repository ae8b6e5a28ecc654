/* The host interface: creation, loading, the back key, teardown. */
#include <filesystem>

#include "editor-fixture.h"
#include "ie-image.h"
#include "ie-test-pictures.h"

namespace {

using Shell = EditorTest;

TEST_F(Shell, CreateBuildsTheEditorAndDestroyReleasesIt)
{
	ASSERT_NE(create_editor(), nullptr);
	Evas_Object *layout = IE_get_view_object(vh);
	ASSERT_NE(layout, nullptr);
	EXPECT_EQ(vh->effect_index, -1);
	EXPECT_NE(vh->color_table, nullptr);
	EXPECT_NE(vh->font_table, nullptr);
	EXPECT_STREQ(elm_object_part_text_get(vh->funcbar, "elm.text.title"), dgettext("image-editor", "IDS_ST_BODY_EDIT"));
	EXPECT_TRUE(elm_object_disabled_get(vh->done_btn));
	EXPECT_FALSE(elm_object_disabled_get(vh->cancel_btn));

	int deleted = 0;
	evas_object_event_callback_add(layout, EVAS_CALLBACK_DEL, [](void *data, Evas *, Evas_Object *, void *) {
		++*static_cast<int *>(data);
	}, &deleted);
	destroy_editor();
	EXPECT_EQ(deleted, 1);
	EXPECT_TRUE(close_requests.empty());
}

TEST_F(Shell, NullArgumentsLogTheTwoGuardLines)
{
	iet::log_clear();
	EXPECT_EQ(IE_create(nullptr), nullptr);
	EXPECT_EQ(iet::log_messages(),
		  (std::vector<std::string>{"Invalid parameter, return NULL!", "(!(parent)) -> IE_create() return"}));

	iet::log_clear();
	EXPECT_EQ(IE_get_view_object(nullptr), nullptr);
	EXPECT_EQ(iet::log_messages(),
		  (std::vector<std::string>{"Invalid parameter, return NULL!",
					    "(!(Viewhandle)) -> IE_get_view_object() return"}));

	iet::log_clear();
	IE_destroy(nullptr);
	EXPECT_EQ(iet::log_messages(),
		  (std::vector<std::string>{"Invalid parameter, return!", "(!(data)) -> _ie_log_manager_destroy() return",
					    "Invalid parameter, return!", "(!(Viewhandle)) -> IE_destroy() return"}));
	for (const auto &line : iet::log_lines()) {
		EXPECT_EQ(line.tag, "IV-EDITOR");
		EXPECT_EQ(line.priority, PLATFORM_LOG_ERROR);
		EXPECT_NE(line.text.find("\033[31m"), std::string::npos) << line.text;
	}

	iet::log_clear();
	IE_setparam(nullptr, "/nonexistent.jpg", 720, 1280, 0);
	IE_pause(nullptr);
	IE_resume(nullptr);
	EXPECT_TRUE(iet::log_lines().empty());
}

TEST_F(Shell, SetparamSwapsTheBoxForQuarterTurns)
{
	std::string path = iet::temp_dir() + "/p.png";
	ASSERT_TRUE(iet::write_picture(path, 64, 48));
	for (int rotation : {0, 90, 180, 270}) {
		ASSERT_NE(create_editor(), nullptr);
		IE_setparam(vh, path.c_str(), 720, 1280, rotation);
		bool turned = rotation % 180 != 0;
		EXPECT_EQ(vh->width, turned ? 1280 : 720) << rotation;
		EXPECT_EQ(vh->height, turned ? 720 : 1280) << rotation;
		destroy_editor();
	}
}

/* Missing, or a JPEG cut short in its data (which the decoder would show
 * with grey where the data is missing). */
TEST_F(Shell, UnloadablePictureClosesOnceFromTheMainLoop)
{
	std::string dir = iet::temp_dir();
	std::string cut = dir + "/cut.jpg";
	ASSERT_TRUE(iet::write_picture(cut, 640, 480));
	std::filesystem::resize_file(cut, std::filesystem::file_size(cut) * 3 / 4);
	for (const std::string &path : { dir + "/missing.jpg", cut }) {
		SCOPED_TRACE(path);
		close_requests.clear();
		ASSERT_NE(create_editor(), nullptr);
		IE_setparam(vh, path.c_str(), 720, 1280, 0);
		EXPECT_EQ(vh->main_image, nullptr);
		EXPECT_TRUE(close_requests.empty()) << "the close request must wait for the main loop";
		iet::run_idlers();
		ASSERT_EQ(close_requests.size(), 1u);
		EXPECT_EQ(close_requests[0], "");
		destroy_editor();
		iet::run_idlers();
		EXPECT_EQ(close_requests.size(), 1u);
	}
	EXPECT_EQ(std::distance(std::filesystem::directory_iterator(dir), std::filesystem::directory_iterator()), 1)
		<< "nothing written";
}

TEST_F(Shell, PictureFailingInTheBackgroundClosesOnce)
{
	ASSERT_NE(create_editor(), nullptr);
	/* Large enough to be decoded in the background, whole but short of
	 * image data: only decoding finds that out. */
	std::string path = iet::temp_dir() + "/damaged.png";
	ASSERT_TRUE(iet::write_png_with_short_data(path, 4000, 3000));
	evas_image_cache_flush(evas());
	IE_setparam(vh, path.c_str(), 720, 1280, 0);
	ASSERT_NE(vh->main_image, nullptr) << "the damage shows only once decoding runs";
	EXPECT_TRUE(iet::run_until([this] { return !close_requests.empty(); }, 10.0));
	iet::run_for(0.2);
	ASSERT_EQ(close_requests.size(), 1u);
	EXPECT_EQ(close_requests[0], "");
	destroy_editor();
}

TEST_F(Shell, DestroyWithThePendingCloseRequestIsSafe)
{
	ASSERT_NE(create_editor(), nullptr);
	IE_setparam(vh, "/nonexistent/picture.jpg", 720, 1280, 0);
	destroy_editor();
	iet::run_idlers();
	EXPECT_TRUE(close_requests.empty());
}

TEST_F(Shell, BackKeyIsCancelAndNeverPopsTheItem)
{
	ASSERT_NE(open_editor_on_picture(320, 240), nullptr);
	Elm_Object_Item *item = vh->navi_item;
	iet::key_press(win(), "Escape");
	EXPECT_EQ(elm_naviframe_top_item_get(vh->naviframe), item);
	EXPECT_EQ(eina_list_count(elm_naviframe_items_get(vh->naviframe)), 1u);
	ASSERT_EQ(close_requests.size(), 1u) << "back in the main view with nothing edited closes";
	EXPECT_EQ(close_requests[0], "");

	vh->edited = EINA_TRUE;
	iet::key_press(win(), "XF86Back");
	EXPECT_EQ(elm_naviframe_top_item_get(vh->naviframe), item);
	EXPECT_NE(vh->popup, nullptr) << "with changes the back key asks first";
	EXPECT_EQ(close_requests.size(), 1u);
}

} // namespace
