/* Done's save as the user meets it: a failed save keeps the edit, a busy
 * media database never stalls the editor, and the saved file shows what
 * the screen showed, with the photograph's metadata. */
#include <sqlite3.h>
#include <sys/mount.h>
#include <sys/statvfs.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <set>
#include <media_db.h>

#include "editor-fixture.h"
#include "ie-image.h"
#include "ie-test-photo.h"

namespace fs = std::filesystem;

namespace {

class SaveFlow : public EditorTest {
protected:
	void TearDown() override
	{
		destroy_editor();
		if (!mount_point.empty())
			umount2(mount_point.c_str(), MNT_DETACH);
		if (holder > 0) {
			kill(holder, SIGKILL);
			waitpid(holder, nullptr, 0);
		}
		unsetenv("MEDIA_DB_BUSY_TIMEOUT_MS");
		EditorTest::TearDown();
	}

	void tap(Evas_Object *button)
	{
		ASSERT_NE(button, nullptr);
		iet::tap_object(button);
		iet::settle();
	}
	Evas_Object *popup_button(const char *part)
	{
		return vh->popup ? elm_object_part_content_get(vh->popup, part) : nullptr;
	}
	void tap_rotate_right()
	{
		tap_tool(2);
		iet::settle();
	}
	/* Another process takes the media database's write lock and keeps it
	 * for `seconds`; returns once it holds it. */
	void hold_database(double seconds)
	{
		ASSERT_EQ(media_db_open(), MEDIA_DB_ERROR_NONE);
		ASSERT_EQ(media_db_close(), MEDIA_DB_ERROR_NONE);
		int ready[2];
		ASSERT_EQ(pipe(ready), 0);
		holder = fork();
		if (holder == 0) {
			sqlite3 *db = nullptr;
			if (sqlite3_open(getenv("MEDIA_DB_PATH"), &db) != SQLITE_OK ||
			    sqlite3_exec(db, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr) != SQLITE_OK)
				_exit(1);
			if (write(ready[1], "x", 1) != 1)
				_exit(1);
			usleep(static_cast<useconds_t>(seconds * 1e6));
			sqlite3_exec(db, "COMMIT", nullptr, nullptr, nullptr);
			_exit(0);
		}
		close(ready[1]);
		char byte;
		ASSERT_EQ(read(ready[0], &byte, 1), 1) << "the lock holder did not start";
		close(ready[0]);
	}
	static int error_lines_naming(const std::string &text)
	{
		int count = 0;
		for (const iet::LogLine &line : iet::log_lines())
			count += line.priority == PLATFORM_LOG_ERROR && line.text.find(text) != std::string::npos;
		return count;
	}
	static std::string register_warning(int result)
	{
		return "Fail to register new edited file to DB : " + std::to_string(result);
	}

	std::string mount_point;
	pid_t holder = -1;
};

TEST_F(SaveFlow, AFailedSaveKeepsTheEditorOpenWithTheEdit)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	tap_rotate_right();
	ASSERT_TRUE(vh->edited);
	auto rotated = picture_pixels();
	// The folder goes away after the picture was loaded.
	fs::remove_all(picture_dir);
	iet::log_clear();

	tap(vh->done_btn);
	ASSERT_NE(vh->popup, nullptr);
	EXPECT_STREQ(evas_object_name_get(vh->popup), "savefailedpopup");
	EXPECT_STREQ(elm_object_text_get(vh->popup), "The picture could not be saved.");
	EXPECT_TRUE(elm_object_disabled_get(vh->done_btn));
	EXPECT_TRUE(close_requests.empty());
	EXPECT_TRUE(vh->edited);
	EXPECT_TRUE(picture_pixels() == rotated);
	EXPECT_EQ(error_lines_naming(strerror(ENOENT)), 1);

	tap(popup_button("button1"));
	EXPECT_EQ(vh->popup, nullptr);
	EXPECT_FALSE(elm_object_disabled_get(vh->done_btn));
	EXPECT_FALSE(elm_object_disabled_get(vh->cancel_btn));
	// Cancel still asks before the edit is thrown away.
	tap(vh->cancel_btn);
	ASSERT_NE(vh->popup, nullptr);
	EXPECT_STREQ(evas_object_name_get(vh->popup), "deletepopup");
	tap(popup_button("button1"));

	// With the folder back, Done saves.
	fs::create_directories(picture_dir);
	tap(vh->done_btn);
	ASSERT_TRUE(wait_for_close());
	EXPECT_EQ(close_requests, std::vector<std::string>{picture_dir + "/photo_e001.jpg"});
	EXPECT_TRUE(fs::is_regular_file(close_requests[0]));
}

TEST_F(SaveFlow, StorageFillingUpWhileWritingOffersTheStorageSettings)
{
	if (geteuid() != 0)
		GTEST_SKIP() << "mounting a small file system needs root";
	mount_point = iet::temp_dir();
	if (mount("tmpfs", mount_point.c_str(), "tmpfs", 0, "size=2m") != 0) {
		std::string reason = strerror(errno);
		mount_point.clear();
		GTEST_SKIP() << "cannot mount a tmpfs here: " << reason;
	}
	allow_efl_error("Image save failed.");
	std::string source = mount_point + "/photo.jpg";
	ASSERT_TRUE(iet::write_picture(source, 640, 480));
	ASSERT_NE(open_editor_on_file(source), nullptr);
	tap_rotate_right();
	// Leave 8 KiB: the free-space check measures the internal storage,
	// which has room; the card fills up in the middle of the JPEG.
	struct statvfs st;
	ASSERT_EQ(statvfs(mount_point.c_str(), &st), 0);
	std::ofstream(mount_point + "/filler") << std::string(st.f_bsize * st.f_bavail - 8192, 'f');

	tap(vh->done_btn);
	ASSERT_NE(vh->popup, nullptr);
	EXPECT_STREQ(evas_object_name_get(vh->popup), "okcancelpopup");
	EXPECT_TRUE(close_requests.empty());
	std::set<std::string> names;
	for (const auto &entry : fs::directory_iterator(mount_point))
		names.insert(entry.path().filename());
	EXPECT_EQ(names, (std::set<std::string>{"filler", "photo.jpg"}));
}

/* Another process holds the database: the main loop keeps running, the
 * processing popup shows, and the editor closes once the row is written. */
TEST_F(SaveFlow, ABusyDatabaseNeverStallsTheEditor)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	tap_rotate_right();
	hold_database(1.5);
	double start = ecore_time_get();
	tap(vh->done_btn);
	EXPECT_LT(ecore_time_get() - start, 1.0) << "Done came back to the main loop";
	EXPECT_TRUE(elm_object_disabled_get(vh->done_btn));
	EXPECT_TRUE(elm_object_disabled_get(vh->cancel_btn));
	// An edit now would be lost with the close: the tools wait too.
	auto saved_pixels = picture_pixels();
	tap_rotate_right();
	EXPECT_TRUE(picture_pixels() == saved_pixels);

	int ticks = 0;
	Ecore_Timer *ticker = ecore_timer_add(0.01, [](void *data) -> Eina_Bool {
		++*static_cast<int *>(data);
		return ECORE_CALLBACK_RENEW;
	}, &ticks);
	EXPECT_TRUE(iet::run_until([this] { return vh->save_popup != nullptr; }, 1.0)) << "no processing popup";
	EXPECT_TRUE(close_requests.empty()) << "closed before the row was written";
	// The back key waits with the popup.
	iet::key_press(win(), "Escape");
	EXPECT_TRUE(close_requests.empty());
	ASSERT_TRUE(wait_for_close());
	ecore_timer_del(ticker);
	EXPECT_GT(ticks, 40) << "the main loop stood still";
	EXPECT_EQ(vh->save_popup, nullptr);
	EXPECT_EQ(close_requests, std::vector<std::string>{picture_dir + "/photo_e001.jpg"});
	Media_Db_Row row;
	EXPECT_EQ(media_db_lookup(close_requests[0].c_str(), &row), MEDIA_DB_ERROR_NONE);
	EXPECT_EQ(iet::log_count(register_warning(MEDIA_DB_ERROR_DB_BUSY)), 0);
}

TEST_F(SaveFlow, ADatabaseBusyPastItsTimeoutIsLoggedAndTheFileKept)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	tap_rotate_right();
	setenv("MEDIA_DB_BUSY_TIMEOUT_MS", "300", 1);
	hold_database(2.0);
	tap(vh->done_btn);
	ASSERT_TRUE(wait_for_close());
	EXPECT_EQ(close_requests, std::vector<std::string>{picture_dir + "/photo_e001.jpg"});
	EXPECT_TRUE(fs::is_regular_file(close_requests[0]));
	EXPECT_EQ(iet::log_count(register_warning(MEDIA_DB_ERROR_DB_BUSY), PLATFORM_LOG_WARN), 1);
}

TEST_F(SaveFlow, DestroyedWhileRegisteringTouchesNothingFreed)
{
	ASSERT_NE(open_editor_on_picture(64, 48), nullptr);
	tap_rotate_right();
	hold_database(1.0);
	tap(vh->done_btn);
	ASSERT_TRUE(iet::run_until([this] { return vh->save_popup != nullptr; }, 1.0));
	destroy_editor();
	// The main loop reaps the holder once it ends.
	ASSERT_TRUE(iet::run_until([this] { return waitpid(holder, nullptr, WNOHANG) == holder || kill(holder, 0) != 0; }));
	holder = -1;
	iet::run_for(0.3);
	EXPECT_TRUE(close_requests.empty());
}

/* A half-transparent picture saves as it looks over white, not over
 * black. */
TEST_F(SaveFlow, TransparencyIsLaidOnWhite)
{
	std::string dir = iet::temp_dir(), source = dir + "/glass.png";
	{
		Evas_Object *img = evas_object_image_filled_add(evas());
		evas_object_image_alpha_set(img, EINA_TRUE);
		evas_object_image_size_set(img, 64, 48);
		auto *pixels = static_cast<uint32_t *>(evas_object_image_data_get(img, EINA_TRUE));
		// (200, 40, 40) at alpha 128, premultiplied.
		for (int i = 0; i < 64 * 48; i++)
			pixels[i] = 128u << 24 | 100u << 16 | 20u << 8 | 20u;
		evas_object_image_data_set(img, pixels);
		ASSERT_TRUE(evas_object_image_save(img, source.c_str(), nullptr, nullptr));
		evas_object_del(img);
	}
	ASSERT_NE(open_editor_on_file(source), nullptr);
	tap_rotate_right();
	tap(vh->done_btn);
	ASSERT_TRUE(wait_for_close());

	Evas_Object *check = evas_object_image_add(evas());
	evas_object_image_file_set(check, close_requests[0].c_str(), nullptr);
	auto *saved = static_cast<const uint32_t *>(evas_object_image_data_get(check, EINA_FALSE));
	ASSERT_NE(saved, nullptr);
	double sum[3] = {};
	for (int i = 0; i < 48 * 64; i++)
		for (int c = 0; c < 3; c++)
			sum[c] += (saved[i] >> (16 - 8 * c)) & 0xFF;
	// Half of (200, 40, 40) and half of white.
	const double expected[3] = {227, 147, 147};
	for (int c = 0; c < 3; c++)
		EXPECT_NEAR(sum[c] / (48 * 64), expected[c], 4.0) << "channel " << c;
	evas_object_del(check);
}

/* A photograph turned by its EXIF block, rotated and saved: upright pixels
 * with Orientation 1, and the rest of its metadata kept. */
TEST_F(SaveFlow, ThePhotographsMetadataGoesWithTheEdit)
{
	std::string dir = iet::temp_dir(), source = dir + "/camera.jpg";
	ASSERT_TRUE(iet::write_photo(source, 64, 48, 6));
	ASSERT_NE(open_editor_on_file(source), nullptr);
	int w = 0, h = 0;
	picture_size(&w, &h);
	ASSERT_EQ(w * 1000 + h, 48 * 1000 + 64) << "shown turned as its EXIF block says";
	tap_rotate_right();
	long before = static_cast<long>(time(nullptr));
	tap(vh->done_btn);
	ASSERT_TRUE(wait_for_close());
	std::string saved = close_requests[0];
	iet::expect_photo_metadata(saved, 64, 48, before);

	// Stored turned a quarter by its EXIF block and a quarter by the user:
	// the marked corner, top left as stored, is at the bottom right.
	Evas_Object *check = evas_object_image_add(evas());
	evas_object_image_load_orientation_set(check, EINA_TRUE);
	evas_object_image_file_set(check, saved.c_str(), nullptr);
	evas_object_image_size_get(check, &w, &h);
	ASSERT_EQ(w * 1000 + h, 64 * 1000 + 48);
	auto *pixels = static_cast<const uint32_t *>(evas_object_image_data_get(check, EINA_FALSE));
	ASSERT_NE(pixels, nullptr);
	EXPECT_GT(pixels[(h - 3) * w + (w - 3)] & 0xFF, 200u) << "marked corner";
	EXPECT_LT(pixels[2 * w + 2] & 0xFF, 160u);
	evas_object_del(check);

	Media_Db_Row row;
	ASSERT_EQ(media_db_lookup(saved.c_str(), &row), MEDIA_DB_ERROR_NONE);
	EXPECT_STREQ(row.date_taken, "2021-07-14 09:30:05");
}

} // namespace
