/* Cancel, Done, the back key and the two popups, through real taps. */
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <media_db.h>

#include "editor-fixture.h"
#include "ie-image.h"
#include "ie-save.h"
#include "ie-test-pictures.h"

namespace {

class DoneCancel : public EditorTest {
protected:
	void tap_button(Evas_Object *button)
	{
		ASSERT_NE(button, nullptr);
		iet::tap_object(button);
		iet::settle();
	}
	Evas_Object *popup_button(const char *part)
	{
		return vh->popup ? elm_object_part_content_get(vh->popup, part) : nullptr;
	}
	void TearDown() override
	{
		destroy_editor();
		if (!mount_point.empty()) {
			umount2(mount_point.c_str(), MNT_DETACH);
			mount_point.clear();
		}
		EditorTest::TearDown();
	}
	std::string mount_point;
};

TEST_F(DoneCancel, CancelWithNothingEditedClosesWithoutAsking)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	tap_button(vh->cancel_btn);
	EXPECT_EQ(vh->popup, nullptr);
	ASSERT_EQ(close_requests.size(), 1u);
	EXPECT_EQ(close_requests[0], "");
}

TEST_F(DoneCancel, DiscardPopupAfterARotation)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	ie_view_mgr_set_view(IE_VIEW_TYPE_ROTATE_RIGHT, vh);
	tap_button(vh->cancel_btn);
	ASSERT_NE(vh->popup, nullptr);
	EXPECT_STREQ(evas_object_name_get(vh->popup), "deletepopup");
	EXPECT_TRUE(elm_object_disabled_get(vh->cancel_btn));
	EXPECT_TRUE(elm_object_disabled_get(vh->done_btn));
	EXPECT_TRUE(close_requests.empty());

	tap_button(popup_button("button1"));
	EXPECT_EQ(vh->popup, nullptr);
	EXPECT_FALSE(elm_object_disabled_get(vh->cancel_btn));
	EXPECT_FALSE(elm_object_disabled_get(vh->done_btn));
	EXPECT_TRUE(close_requests.empty());

	tap_button(vh->cancel_btn);
	tap_button(popup_button("button2"));
	EXPECT_EQ(vh->popup, nullptr);
	ASSERT_EQ(close_requests.size(), 1u);
	EXPECT_EQ(close_requests[0], "");
}

TEST_F(DoneCancel, BackKeyWithAPopupClosesOnlyThePopup)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	ie_view_mgr_set_view(IE_VIEW_TYPE_ROTATE_LEFT, vh);
	tap_button(vh->cancel_btn);
	ASSERT_NE(vh->popup, nullptr);
	iet::key_press(win(), "Escape");
	EXPECT_EQ(vh->popup, nullptr);
	EXPECT_TRUE(close_requests.empty());
	EXPECT_EQ(elm_naviframe_top_item_get(vh->naviframe), vh->navi_item);
}

TEST_F(DoneCancel, DoneAfterARotationSavesBesideTheSource)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	std::string prepared = ie_save_path_get();
	EXPECT_EQ(prepared, picture_dir + "/photo_e001.jpg");
	struct stat before;
	ASSERT_EQ(stat(picture_path.c_str(), &before), 0);

	ie_view_mgr_set_view(IE_VIEW_TYPE_ROTATE_RIGHT, vh);
	auto rotated = picture_pixels();
	tap_button(vh->done_btn);
	ASSERT_TRUE(wait_for_close());
	ASSERT_EQ(close_requests.size(), 1u);
	EXPECT_EQ(close_requests[0], prepared);

	/* The new file holds the rotated picture; the source is untouched. */
	Evas_Object *check = evas_object_image_add(evas());
	evas_object_image_file_set(check, prepared.c_str(), nullptr);
	int w = 0, h = 0;
	evas_object_image_size_get(check, &w, &h);
	EXPECT_EQ(w, 48);
	EXPECT_EQ(h, 64);
	auto *saved = static_cast<const uint32_t *>(evas_object_image_data_get(check, EINA_FALSE));
	ASSERT_NE(saved, nullptr);
	int worst = 0;
	for (size_t i = 0; i < rotated.size(); i++)
		for (int shift = 0; shift < 24; shift += 8)
			worst = std::max(worst, std::abs(int((saved[i] >> shift) & 0xff) - int((rotated[i] >> shift) & 0xff)));
	EXPECT_LT(worst, 40) << "JPEG noise only";
	evas_object_del(check);

	struct stat after;
	ASSERT_EQ(stat(picture_path.c_str(), &after), 0);
	EXPECT_EQ(after.st_size, before.st_size);
	EXPECT_EQ(after.st_mtim.tv_nsec, before.st_mtim.tv_nsec);

	Media_Db_Row row;
	ASSERT_EQ(media_db_lookup(prepared.c_str(), &row), MEDIA_DB_ERROR_NONE);
	EXPECT_STREQ(row.mime_type, "image/jpeg");
	EXPECT_EQ(row.width, 48);
	EXPECT_EQ(row.height, 64);
}

/* A picture stored turned or mirrored (a comment before its EXIF block),
 * turned right and saved: the new file holds the upright picture turned
 * right, at the size shown, whichever way it went in. */
TEST_F(DoneCancel, DoneSavesAnOrientedPictureUprightOnEveryWayIn)
{
	/* In a 100 x 100 box: as is, resampled, and in the background. */
	struct Way { const char *name; int w, h; bool reduced; };
	for (const Way &way : { Way{ "as is", 64, 48, false }, Way{ "resampled", 240, 180, true },
				Way{ "in the background", 360, 270, true } })
		for (int orientation = 1; orientation <= 8; orientation++) {
			SCOPED_TRACE(std::string(way.name) + ", orientation " + std::to_string(orientation));
			std::string dir = iet::temp_dir(), path = dir + "/photo.jpg";
			ASSERT_TRUE(iet::write_oriented_jpeg(path, way.w, way.h, orientation, orientation % 2 == 0, true));
			close_requests.clear();
			ASSERT_NE(create_editor(), nullptr);
			IE_setparam(vh, path.c_str(), 100, 100, 0);
			ASSERT_TRUE(iet::run_until([this] { return !iet::image_pixels(inner_image()).data.empty(); }));
			iet::run_idlers();
			ie_view_mgr_set_view(IE_VIEW_TYPE_ROTATE_RIGHT, vh);
			tap_button(vh->done_btn);
			ASSERT_TRUE(wait_for_close());
			ASSERT_EQ(close_requests.size(), 1u);
			ASSERT_EQ(close_requests[0], dir + "/photo_e001.jpg");

			iet::Pixels saved = iet::stored_pixels(close_requests[0]);
			const bool turned = orientation >= 5;
			const int long_side = way.reduced ? 100 : 64, short_side = way.reduced ? 75 : 48;
			EXPECT_EQ(saved.w, turned ? long_side : short_side);
			EXPECT_EQ(saved.h, turned ? short_side : long_side);
			iet::Pixels want = iet::turned_upright(iet::turned_upright(iet::stored_pixels(path), orientation), 6);
			EXPECT_LE(iet::grid_difference(saved, want), 24);
			destroy_editor();
		}
}

TEST_F(DoneCancel, DoneWithoutChangesStaysOpen)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	ie_view_mgr_set_view(IE_VIEW_TYPE_EFFECT, vh);
	elm_object_disabled_set(vh->done_btn, EINA_FALSE);
	tap_button(vh->done_btn);
	EXPECT_EQ(ie_view_mgr_get_current_view(), IE_VIEW_TYPE_MAIN);
	EXPECT_TRUE(close_requests.empty());
}

TEST_F(DoneCancel, DoneOnAFullStorageOffersTheStorageSettings)
{
	if (geteuid() != 0)
		GTEST_SKIP() << "mounting a small file system needs root";
	mount_point = iet::temp_dir();
	/* 1 MiB is below the free space a save needs. */
	if (mount("tmpfs", mount_point.c_str(), "tmpfs", 0, "size=1m") != 0) {
		std::string reason = strerror(errno);
		mount_point.clear();
		GTEST_SKIP() << "cannot mount a tmpfs here: " << reason;
	}
	setenv("STORAGE_INTERNAL_ROOT", mount_point.c_str(), 1);

	std::string launchers = getenv("APP_LAUNCH_DIR");
	std::string marker = iet::temp_dir() + "/launched";
	mkdir(launchers.c_str(), 0755);
	{
		std::ofstream script(launchers + "/setting-storage-efl");
		/* Written aside and renamed, so the file is whole once it is there. */
		script << "#!/bin/sh\necho \"$@\" > " << marker << ".part && mv " << marker << ".part " << marker << "\n";
	}
	chmod((launchers + "/setting-storage-efl").c_str(), 0755);

	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	ie_view_mgr_set_view(IE_VIEW_TYPE_ROTATE_RIGHT, vh);
	tap_button(vh->done_btn);
	ASSERT_NE(vh->popup, nullptr);
	EXPECT_STREQ(evas_object_name_get(vh->popup), "okcancelpopup");
	EXPECT_TRUE(close_requests.empty());
	EXPECT_NE(access(ie_save_path_get(), F_OK), 0) << "nothing was written";

	tap_button(popup_button("button1"));
	EXPECT_EQ(vh->popup, nullptr);
	EXPECT_TRUE(close_requests.empty()) << "the editor stays open";
	// The launcher's shell makes the file before it writes the line.
	std::string line;
	EXPECT_TRUE(iet::run_until([&] {
		std::ifstream args(marker);
		return std::getline(args, line) && !args.eof();
	}, 5.0)) << "the storage settings were launched";
	EXPECT_NE(line.find("/appcontrol/operation/view"), std::string::npos) << line;
}

} // namespace
