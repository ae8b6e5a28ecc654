/* End to end: the demo host drives the real editor with taps on its real
 * widgets, as a person would, and the saved file is checked on disk and in
 * the media database. */
#include <sys/stat.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <media_db.h>

#include "ie-test-harness.h"
#include "ie-test-pictures.h"

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

/* Each EXIF orientation, with a comment before the EXIF block as common
 * image editors write it: turned right and saved, the new file is the
 * upright picture turned right, and its row says so. */
class DemoOrientation : public Demo, public ::testing::WithParamInterface<int> {};

TEST_P(DemoOrientation, TurnedRightAndSavedIsTheUprightPictureTurnedRight)
{
	const int orientation = GetParam();
	std::string dir = iet::temp_dir();
	std::string picture = dir + "/oriented.jpg";
	ASSERT_TRUE(iet::write_oriented_jpeg(picture, 320, 240, orientation, orientation % 2 == 0, true));
	int status = 0;
	std::string output = run_host(picture, "--do rotate-right --do done", &status);
	ASSERT_EQ(status, 0) << output;
	std::string path = saved_path(output);
	ASSERT_EQ(path, dir + "/oriented_e001.jpg") << output;

	iet::Pixels saved = iet::stored_pixels(path);
	const bool turned = orientation >= 5;
	EXPECT_EQ(saved.w, turned ? 320 : 240);
	EXPECT_EQ(saved.h, turned ? 240 : 320);
	iet::Pixels want = iet::turned_upright(iet::turned_upright(iet::stored_pixels(picture), orientation), 6);
	EXPECT_LE(iet::grid_difference(saved, want), 24);
	Media_Db_Row row;
	ASSERT_EQ(media_db_lookup(path.c_str(), &row), MEDIA_DB_ERROR_NONE);
	EXPECT_EQ(row.width, saved.w);
	EXPECT_EQ(row.height, saved.h);
}

INSTANTIATE_TEST_SUITE_P(Exif, DemoOrientation, ::testing::Range(1, 9));

/* A JPEG cut short in its data: the editor closes before showing it, the
 * host says the picture could not be opened, and nothing is written, not
 * even the screenshot. */
TEST_F(Demo, ACutPictureIsReportedAsNotOpenedAndNothingIsWritten)
{
	std::string dir = iet::temp_dir();
	std::string picture = dir + "/cut.jpg";
	ASSERT_TRUE(iet::write_picture(picture, 640, 480));
	iet::Bytes bytes = iet::read_bytes(picture);
	bytes.resize(bytes.size() * 3 / 5);
	ASSERT_TRUE(iet::write_bytes(picture, bytes));
	int status = 0;
	std::string output = run_host(picture, "--do rotate-right --do done --screenshot " + dir + "/shot.png", &status);
	EXPECT_NE(status, 0) << output;
	EXPECT_NE(output.find("closed: the picture could not be opened: " + picture + "; nothing saved"), std::string::npos)
		<< output;
	EXPECT_EQ(output.find("saved: "), std::string::npos) << output;
	EXPECT_EQ(output.find("cannot rotate-right"), std::string::npos) << output;
	EXPECT_EQ(std::distance(std::filesystem::directory_iterator(dir), std::filesystem::directory_iterator()), 1)
		<< "nothing written";
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

} // namespace
