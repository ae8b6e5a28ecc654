/* End to end through the README's demo command (`./ie demo`, on this build
 * tree): the demo host drives the real editor with taps on its real widgets,
 * as a person would, and the saved file is checked on disk and in the media
 * database. */
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <media_db.h>

#include "ie-engine.h"

#include "ie-test-harness.h"
#include "ie-test-photo.h"
#include "ie-test-pictures.h"

namespace {

class Demo : public iet::EflTest {
protected:
	/* Runs `ie demo` on `picture` with `args` (the build tree as `tree`);
	 * returns its output. */
	std::string run_host(const std::string &picture, const std::string &args, int *status,
			     const std::string &tree = IE_BUILD_TREE)
	{
		std::string command = "IE_BUILD_DIR='" + tree + "' " IE_TEST_SOURCE_DIR "/ie demo --headless '" +
				      picture + "' " + args + " 2>&1";
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

TEST_F(Demo, CropDragAndDoneWriteTheCroppedPicture)
{
	std::string dir = iet::temp_dir();
	std::string picture = dir + "/view.jpg";
	ASSERT_TRUE(iet::write_picture(picture, 4000, 3000, "quality=95"));
	int status = 0;
	std::string output =
		run_host(picture, "--do crop --do drag:bottom-right:-200:-150 --do done --do done", &status);
	ASSERT_EQ(status, 0) << output;
	std::string path = saved_path(output);
	ASSERT_EQ(path, dir + "/view_e001.jpg") << output;

	/* Held at 1280 x 960 and shown 720 wide: the box starts 400 x 270 at
	 * (160, 135) over the picture, the drag leaves 200 x 120 of it, which
	 * is 355 x 213 picture pixels from (284, 240). */
	Evas_Object *check = evas_object_image_add(evas());
	evas_object_image_file_set(check, path.c_str(), nullptr);
	int w = 0, h = 0;
	evas_object_image_size_get(check, &w, &h);
	ASSERT_EQ(w, 355);
	ASSERT_EQ(h, 213);
	/* The source's gradient: red follows x, green follows y. */
	auto *pixels = static_cast<const uint32_t *>(evas_object_image_data_get(check, EINA_FALSE));
	ASSERT_NE(pixels, nullptr);
	for (auto [x, y] : {std::pair{2, 2}, std::pair{w - 3, 2}, std::pair{2, h - 3}, std::pair{w - 3, h - 3}}) {
		uint32_t p = pixels[y * w + x];
		EXPECT_NEAR(int((p >> 16) & 0xff), (284 + x) * 3.125 * 255 / 3999, 6) << x << "," << y;
		EXPECT_NEAR(int((p >> 8) & 0xff), (240 + y) * 3.125 * 255 / 2999, 6) << x << "," << y;
	}
	evas_object_del(check);
	Media_Db_Row row;
	ASSERT_EQ(media_db_lookup(path.c_str(), &row), MEDIA_DB_ERROR_NONE);
	EXPECT_EQ(row.width, 355);
	EXPECT_EQ(row.height, 213);

	/* Left with Cancel, the crop view changes nothing: a rotation then
	 * saves the whole picture. */
	output = run_host(picture,
			  "--do crop --do drag:bottom-right:-200:-150 --do pinch:2 --do cancel --do rotate-right --do done",
			  &status);
	ASSERT_EQ(status, 0) << output;
	path = saved_path(output);
	ASSERT_EQ(path, dir + "/view_e002.jpg") << output;
	check = evas_object_image_add(evas());
	evas_object_image_file_set(check, path.c_str(), nullptr);
	evas_object_image_size_get(check, &w, &h);
	EXPECT_EQ(w, 960);
	EXPECT_EQ(h, 1280);
	evas_object_del(check);

	/* A part that is not one of the box's, or no box at all, is refused. */
	output = run_host(picture, "--do crop --do drag:middle:10:10", &status);
	EXPECT_NE(status, 0) << output;
	output = run_host(picture, "--do drag:inside:10:10", &status);
	EXPECT_NE(status, 0) << output;
}

/* The README's example on the bundled picture: the saved file shows Sepia
 * at the intensity the drag left, over the picture as the editor holds it
 * (decoded and scaled by the engine to the window's size). */
TEST_F(Demo, EffectAndIntensityThenDoneSaveTheBlendedEffect)
{
	std::string dir = iet::temp_dir();
	std::string picture = dir + "/lake.jpg";
	std::filesystem::copy_file(IE_SAMPLE_PICTURE, picture);
	int status = 0;
	std::string output = run_host(picture, "--do effect:sepia --do intensity:-120 --do done", &status);
	ASSERT_EQ(status, 0) << output;
	std::string path = saved_path(output);
	ASSERT_EQ(path, dir + "/lake_e001.jpg") << output;

	auto load = [this](const std::string &file, int *w, int *h) {
		Evas_Object *image = evas_object_image_add(evas());
		evas_object_image_file_set(image, file.c_str(), nullptr);
		evas_object_image_size_get(image, w, h);
		auto *data = static_cast<const uint32_t *>(evas_object_image_data_get(image, EINA_FALSE));
		std::vector<uint32_t> pixels;
		if (data)
			pixels.assign(data, data + size_t(*w) * *h);
		evas_object_del(image);
		return pixels;
	};
	int sw = 0, sh = 0, w = 0, h = 0;
	std::vector<uint32_t> source = load(picture, &sw, &sh);
	std::vector<uint32_t> saved = load(path, &w, &h);
	ASSERT_FALSE(source.empty());
	ASSERT_EQ(w, 1280) << "the sample picture fitted to the 720 x 1280 window";
	ASSERT_EQ(h, 960);

	std::vector<uint32_t> unedited(saved.size()), sepia(saved.size());
	IEL_Image full = {uint32_t(sw), uint32_t(sh), IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(source.data())};
	IEL_Image in = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(unedited.data())};
	ASSERT_EQ(IEL_Resize_Image(&full, &in), IEL_OK);
	std::vector<uint32_t> expected = unedited;
	IEL_Image out = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(sepia.data())};
	ASSERT_EQ(IEL_Run_Effect(&in, &out, IE_EFFECT_SEPIA), IEL_OK);
	IEL_Image blended = {uint32_t(w), uint32_t(h), IEL_FORMAT_BGRA8888, reinterpret_cast<uint8_t *>(expected.data())};
	ASSERT_EQ(IEL_Alpha_blending(&out, &blended, 70.0f), IEL_OK);

	auto mean_difference = [](const std::vector<uint32_t> &a, const std::vector<uint32_t> &b) {
		double total = 0;
		for (size_t i = 0; i < a.size(); i++)
			for (int shift = 0; shift < 24; shift += 8)
				total += std::abs(int((a[i] >> shift) & 0xff) - int((b[i] >> shift) & 0xff));
		return total / (a.size() * 3.0);
	};
	EXPECT_LT(mean_difference(saved, expected), 3.0) << "JPEG noise only";
	EXPECT_GT(mean_difference(saved, unedited), 15.0) << "the effect shows";

	Media_Db_Row row;
	EXPECT_EQ(media_db_lookup(path.c_str(), &row), MEDIA_DB_ERROR_NONE);
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

/* A checkout deep in the file system puts the build tree, and with it EFL's
 * home, at a long path; efreetd's socket must still get a short one, or the
 * daemon aborts and the editor waits 10 seconds for it. */
TEST_F(Demo, ADeepCheckoutStartsWithoutWaitingForTheDesktopDaemon)
{
	std::string deep = iet::temp_dir();
	while (deep.size() < 150)
		deep += "/a-deep-checkout-path";
	ASSERT_TRUE(std::filesystem::create_directories(deep));
	std::string tree = deep + "/build";
	ASSERT_EQ(symlink(IE_BUILD_TREE, tree.c_str()), 0);
	std::string picture = iet::temp_dir() + "/c.jpg";
	ASSERT_TRUE(iet::write_picture(picture, 320, 240));

	int status = 0;
	std::string output = run_host(picture, "--screenshot " + iet::temp_dir() + "/c.png", &status, tree);
	EXPECT_EQ(status, 0) << output;
	EXPECT_EQ(output.find("buffer overflow"), std::string::npos) << output;
	EXPECT_EQ(output.find("efreetd"), std::string::npos) << output;
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
