/* End to end: the demo host drives the real editor with taps on its real
 * widgets, as a person would, and the saved file is checked on disk and in
 * the media database. */
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <fstream>
#include <media_db.h>

#include "ie-test-harness.h"
#include "ie-test-photo.h"

namespace {

class Demo : public iet::EflTest {
protected:
	/* Runs the host on `picture` with `args`; returns its output. */
	std::string run_host(const std::string &picture, const std::string &args, int *status)
	{
		std::string command = std::string(IE_DEMO_HOST) + " --headless '" + picture + "' " + args + " 2>&1";
		FILE *pipe = popen(command.c_str(), "r");
		std::string output;
		char buffer[512];
		while (pipe && fgets(buffer, sizeof(buffer), pipe))
			output += buffer;
		*status = pipe ? pclose(pipe) : -1;
		return output;
	}
	static std::string saved_path(const std::string &output)
	{
		size_t at = output.find("saved: ");
		if (at == std::string::npos)
			return {};
		size_t end = output.find('\n', at);
		return output.substr(at + 7, end - at - 7);
	}
};

TEST_F(Demo, RotateThenDoneWritesTheRotatedPictureBesideTheSource)
{
	std::string dir = iet::temp_dir();
	std::string picture = dir + "/holiday.jpg";
	ASSERT_TRUE(iet::write_picture(picture, 800, 600, "quality=95"));
	int status = 0;
	std::string shot = dir + "/after.png";
	std::string output = run_host(picture, "--do rotate-right --do done --screenshot " + shot, &status);
	ASSERT_EQ(status, 0) << output;
	std::string path = saved_path(output);
	ASSERT_EQ(path, dir + "/holiday_e001.jpg") << output;

	Evas_Object *check = evas_object_image_add(evas());
	evas_object_image_file_set(check, path.c_str(), nullptr);
	int w = 0, h = 0;
	evas_object_image_size_get(check, &w, &h);
	EXPECT_EQ(w, 600);
	EXPECT_EQ(h, 800);
	/* The marked corner of the source (top left) is now at the top right. */
	auto *pixels = static_cast<const uint32_t *>(evas_object_image_data_get(check, EINA_FALSE));
	ASSERT_NE(pixels, nullptr);
	EXPECT_GT((pixels[5 * w + (w - 6)] & 0xff), 200u) << "marked corner";
	EXPECT_LT((pixels[5 * w + 5] & 0xff), 160u);
	evas_object_del(check);

	Media_Db_Row row;
	ASSERT_EQ(media_db_lookup(path.c_str(), &row), MEDIA_DB_ERROR_NONE);
	EXPECT_EQ(row.width, 600);
	EXPECT_EQ(row.height, 800);
}

TEST_F(Demo, ClosingWithoutDoneSavesNothing)
{
	std::string dir = iet::temp_dir();
	std::string picture = dir + "/a.png";
	ASSERT_TRUE(iet::write_picture(picture, 320, 240));
	int status = 0;
	std::string output = run_host(picture, "--do cancel", &status);
	EXPECT_EQ(status, 0) << output;
	EXPECT_NE(output.find("closed: nothing saved"), std::string::npos) << output;
	struct stat st;
	EXPECT_NE(stat((dir + "/a_e001.jpg").c_str(), &st), 0);

	/* The host closes while the discard popup is still up. */
	output = run_host(picture, "--do rotate-right --do cancel", &status);
	EXPECT_EQ(status, 0) << output;
	EXPECT_EQ(output.find("ERR<"), std::string::npos) << output;
	EXPECT_NE(stat((dir + "/a_e001.jpg").c_str(), &st), 0);
}

TEST_F(Demo, HeadlessRunWritesAScreenshot)
{
	std::string dir = iet::temp_dir();
	std::string picture = dir + "/b.jpg";
	ASSERT_TRUE(iet::write_picture(picture, 640, 480));
	int status = 0;
	std::string shot = dir + "/editor.png";
	std::string output = run_host(picture, "--screenshot " + shot, &status);
	EXPECT_EQ(status, 0) << output;
	Evas_Object *check = evas_object_image_add(evas());
	evas_object_image_file_set(check, shot.c_str(), nullptr);
	int w = 0, h = 0;
	evas_object_image_size_get(check, &w, &h);
	EXPECT_EQ(w, 720);
	EXPECT_EQ(h, 1280);
	evas_object_del(check);
}

/* A photograph turned by its EXIF block, rotated right and saved: upright,
 * with its metadata, its date taken in the media database. */
TEST_F(Demo, APhotographKeepsItsMetadata)
{
	std::string dir = iet::temp_dir();
	std::string photo = dir + "/camera.jpg";
	ASSERT_TRUE(iet::write_photo(photo, 800, 600, 6));
	long before = static_cast<long>(time(nullptr));
	int status = 0;
	std::string output = run_host(photo, "--do rotate-right --do done", &status);
	ASSERT_EQ(status, 0) << output;
	std::string path = saved_path(output);
	ASSERT_EQ(path, dir + "/camera_e001.jpg") << output;
	iet::expect_photo_metadata(path, 800, 600, before);

	Evas_Object *check = evas_object_image_add(evas());
	evas_object_image_load_orientation_set(check, EINA_TRUE);
	evas_object_image_file_set(check, path.c_str(), nullptr);
	int w = 0, h = 0;
	evas_object_image_size_get(check, &w, &h);
	ASSERT_EQ(w * 1000 + h, 800 * 1000 + 600);
	/* Stored top left, the marked corner is turned twice to bottom right. */
	auto *pixels = static_cast<const uint32_t *>(evas_object_image_data_get(check, EINA_FALSE));
	ASSERT_NE(pixels, nullptr);
	EXPECT_GT(pixels[(h - 6) * w + (w - 6)] & 0xff, 200u) << "marked corner";
	EXPECT_LT(pixels[5 * w + 5] & 0xff, 160u);
	evas_object_del(check);

	Media_Db_Row row;
	ASSERT_EQ(media_db_lookup(path.c_str(), &row), MEDIA_DB_ERROR_NONE);
	EXPECT_STREQ(row.date_taken, "2021-07-14 09:30:05");
}

/* A save that fails keeps the editor open with its popup; its OK closes
 * only the popup. */
TEST_F(Demo, ASaveThatFailsKeepsTheEditorOpen)
{
	if (geteuid() != 0)
		GTEST_SKIP() << "a read-only folder needs a mount, which needs root";
	std::string dir = iet::temp_dir();
	if (mount("tmpfs", dir.c_str(), "tmpfs", 0, "size=4m") != 0)
		GTEST_SKIP() << "cannot mount a tmpfs here: " << strerror(errno);
	std::string picture = dir + "/a.jpg";
	bool written = iet::write_picture(picture, 320, 240);
	bool read_only = mount(nullptr, dir.c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr) == 0;
	int status = 0;
	std::string output = written && read_only
		? run_host(picture, "--do rotate-right --do done --do failed-ok --do cancel --do discard", &status)
		: std::string();
	umount2(dir.c_str(), MNT_DETACH);
	ASSERT_TRUE(written && read_only);
	EXPECT_EQ(status, 0) << output;
	EXPECT_NE(output.find("step 3: failed-ok"), std::string::npos) << output;
	EXPECT_NE(output.find("closed: nothing saved"), std::string::npos) << output;
	EXPECT_EQ(output.find("saved: "), std::string::npos) << output;
}

} // namespace
