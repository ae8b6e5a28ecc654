#include <media_db.h>
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "ie-test-harness.h"
#include "ie-test-photo.h"
#include "ie-test-pictures.h"

namespace {

using Bytes = std::vector<unsigned char>;

Bytes read_file(const std::string &path)
{
	std::ifstream in(path, std::ios::binary);
	return Bytes(std::istreambuf_iterator<char>(in), {});
}

void write_file(const std::string &path, const Bytes &bytes)
{
	std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char *>(bytes.data()),
						    static_cast<std::streamsize>(bytes.size()));
}

Bytes operator+(Bytes a, const Bytes &b)
{
	a.insert(a.end(), b.begin(), b.end());
	return a;
}

class MediaContent : public iet::EflTest {
protected:
	void SetUp() override
	{
		iet::EflTest::SetUp();
		dir = iet::temp_dir();
		db_path = dir + "/db/new/media.db";
		setenv("MEDIA_DB_PATH", db_path.c_str(), 1);
	}

	// A real JPEG with an EXIF block carrying `orientation` right after the
	// start-of-image marker.
	Bytes jpeg_with_orientation(int w, int h, unsigned char orientation)
	{
		EXPECT_TRUE(iet::write_picture(dir + "/plain.jpg", w, h));
		Bytes jpeg = read_file(dir + "/plain.jpg");
		Bytes app1 = {0xFF, 0xE1, 0x00, 34, 'E', 'x', 'i', 'f', 0, 0, 'I', 'I', 0x2A, 0x00, 0x08, 0x00, 0x00, 0x00,
			      0x01, 0x00, 0x12, 0x01, 0x03, 0x00, 0x01, 0x00, 0x00, 0x00, orientation, 0x00, 0x00, 0x00,
			      0x00, 0x00, 0x00, 0x00};
		return Bytes(jpeg.begin(), jpeg.begin() + 2) + app1 + Bytes(jpeg.begin() + 2, jpeg.end());
	}

	void scan_and_expect_row(const std::string &path, const char *mime, int width, int height)
	{
		SCOPED_TRACE(path);
		ASSERT_EQ(media_content_scan_file(path.c_str()), MEDIA_DB_ERROR_NONE);
		Media_Db_Row record = {};
		ASSERT_EQ(media_db_lookup(path.c_str(), &record), MEDIA_DB_ERROR_NONE);
		struct stat st;
		ASSERT_EQ(stat(path.c_str(), &st), 0);
		EXPECT_STREQ(record.mime_type, mime);
		EXPECT_EQ(record.width, width);
		EXPECT_EQ(record.height, height);
		EXPECT_EQ(record.size, st.st_size);
		EXPECT_EQ(record.modified_time, st.st_mtime);
	}

	std::string dir;
	std::string db_path;
};

} // namespace

TEST_F(MediaContent, ScanRecordsTypeAndShownSizeFromTheContent)
{
	std::string png = dir + "/a.png", jpg = dir + "/b.jpg", turned = dir + "/turned.jpg";
	ASSERT_TRUE(iet::write_picture(png, 40, 30));
	ASSERT_TRUE(iet::write_picture(jpg, 64, 48, "quality=90"));
	write_file(turned, jpeg_with_orientation(64, 48, 6));
	// Scanning works through a shared connection as well as without one.
	ASSERT_EQ(media_db_open(), MEDIA_DB_ERROR_NONE);
	scan_and_expect_row(png, "image/png", 40, 30);
	EXPECT_EQ(media_db_close(), MEDIA_DB_ERROR_NONE);
	scan_and_expect_row(jpg, "image/jpeg", 64, 48);
	// Orientation 6 shows the picture a quarter turned.
	scan_and_expect_row(turned, "image/jpeg", 48, 64);
	// The EXIF block after a comment and in big-endian order is read too;
	// only the first block counts.
	std::string commented = dir + "/commented.jpg", two_blocks = dir + "/two-blocks.jpg";
	ASSERT_TRUE(iet::write_oriented_jpeg(commented, 64, 48, 8, true, true));
	scan_and_expect_row(commented, "image/jpeg", 48, 64);
	write_file(two_blocks, iet::jpeg_with_segments(read_file(jpg), {iet::exif_segment(1, false), iet::exif_segment(6, true)}, true));
	scan_and_expect_row(two_blocks, "image/jpeg", 64, 48);

	// The name says PNG; on a rescan the new content decides.
	write_file(png, jpeg_with_orientation(20, 10, 1));
	scan_and_expect_row(png, "image/jpeg", 20, 10);

	// Bottom-up is the usual row order; a negative height means top-down.
	Bytes bmp = {'B', 'M', 0, 0, 0, 0, 0, 0, 0, 0, 54, 0, 0, 0, 40, 0, 0, 0, 3, 0, 0, 0, 0xFE, 0xFF, 0xFF, 0xFF, 1, 0, 24, 0};
	bmp.resize(54 + 2 * 12);
	write_file(dir + "/top-down.bmp", bmp);
	scan_and_expect_row(dir + "/top-down.bmp", "image/bmp", 3, 2);
	// 200 x 2, one bit per pixel, rows of 25 bytes.
	write_file(dir + "/mono.wbmp", Bytes{0, 0, 0x81, 0x48, 0x02} + Bytes(50, 0xFF));
	scan_and_expect_row(dir + "/mono.wbmp", "image/vnd.wap.wbmp", 200, 2);

	sqlite3 *db = nullptr;
	ASSERT_EQ(sqlite3_open_v2(db_path.c_str(), &db, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
	std::string mode;
	auto first_column = [](void *out, int, char **values, char **) { return *static_cast<std::string *>(out) = values[0], 0; };
	EXPECT_EQ(sqlite3_exec(db, "PRAGMA journal_mode", first_column, &mode, nullptr), SQLITE_OK);
	EXPECT_EQ(mode, "wal");
	sqlite3_close(db);
}

TEST_F(MediaContent, MissingNonMediaAndTruncatedFilesAreRefused)
{
	ASSERT_TRUE(iet::write_picture(dir + "/whole.png", 40, 30));
	Bytes whole_png = read_file(dir + "/whole.png");
	Bytes jpeg = jpeg_with_orientation(16, 16, 1);
	std::string text = dir + "/notes.jpg", empty = dir + "/empty.png", short_png = dir + "/short.png";
	std::string no_frame = dir + "/no-frame.jpg", bad_wbmp = dir + "/bad.wbmp";
	write_file(text, {'h', 'e', 'l', 'l', 'o', '\n'});
	write_file(empty, {});
	write_file(short_png, Bytes(whole_png.begin(), whole_png.begin() + 16));
	write_file(no_frame, Bytes(jpeg.begin(), jpeg.begin() + 40));
	// Two zero bytes and a size that does not match the file length.
	write_file(bad_wbmp, {0, 0, 0x0A, 0x02, 0xFF});

	for (const std::string &path : {dir + "/missing.jpg", dir, text, empty, short_png, no_frame, bad_wbmp}) {
		EXPECT_NE(media_content_scan_file(path.c_str()), MEDIA_DB_ERROR_NONE) << path;
		Media_Db_Row record = {};
		EXPECT_NE(media_db_lookup(path.c_str(), &record), MEDIA_DB_ERROR_NONE) << path;
	}
	EXPECT_EQ(media_content_scan_file(nullptr), MEDIA_DB_ERROR_INVALID_PARAMETER);
	EXPECT_EQ(media_content_scan_file(""), MEDIA_DB_ERROR_INVALID_PARAMETER);
}

/* One file has one row whatever path names it: relative, with "." or
 * "..", or through a link; a lookup finds it by any of them. */
TEST_F(MediaContent, RowsAreKeyedByTheCanonicalPath)
{
	std::filesystem::create_directories(dir + "/pics");
	std::string photo = dir + "/pics/p.jpg";
	ASSERT_TRUE(iet::write_picture(photo, 16, 8));
	ASSERT_EQ(symlink((dir + "/pics").c_str(), (dir + "/link").c_str()), 0);
	std::string cwd = std::filesystem::current_path();
	std::filesystem::current_path(dir);
	for (const char *path : {"pics/./p.jpg", "pics/../pics/p.jpg", "link/p.jpg"})
		EXPECT_EQ(media_content_scan_file(path), MEDIA_DB_ERROR_NONE) << path;
	Media_Db_Row record = {};
	EXPECT_EQ(media_db_lookup("./pics//p.jpg", &record), MEDIA_DB_ERROR_NONE);
	std::filesystem::current_path(cwd);

	sqlite3 *db = nullptr;
	ASSERT_EQ(sqlite3_open_v2(db_path.c_str(), &db, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
	std::vector<std::string> keys;
	auto collect = [](void *out, int, char **values, char **) {
		static_cast<std::vector<std::string> *>(out)->push_back(values[0]);
		return 0;
	};
	EXPECT_EQ(sqlite3_exec(db, "SELECT path FROM media", collect, &keys, nullptr), SQLITE_OK);
	sqlite3_close(db);
	char *canonical = realpath(photo.c_str(), nullptr);
	EXPECT_EQ(keys, std::vector<std::string>{canonical});
	free(canonical);
}

/* A photograph's row carries when it was taken, so that a viewer can sort
 * by it; a database made before that column existed gains it. */
TEST_F(MediaContent, RowsCarryTheDateTaken)
{
	std::filesystem::create_directories(dir + "/db/new");
	sqlite3 *db = nullptr;
	ASSERT_EQ(sqlite3_open(db_path.c_str(), &db), SQLITE_OK);
	ASSERT_EQ(sqlite3_exec(db,
			       "CREATE TABLE media (path TEXT PRIMARY KEY NOT NULL, mime_type TEXT NOT NULL,"
			       " size INTEGER NOT NULL, width INTEGER NOT NULL, height INTEGER NOT NULL,"
			       " modified_time INTEGER NOT NULL)",
			       nullptr, nullptr, nullptr),
		  SQLITE_OK);
	sqlite3_close(db);

	std::string photo = dir + "/camera.jpg", png = dir + "/plain.png", undated = dir + "/undated.jpg";
	ASSERT_TRUE(iet::write_photo(photo, 32, 24, 1));
	ASSERT_TRUE(iet::write_picture(png, 32, 24));
	ASSERT_TRUE(iet::write_picture(undated, 32, 24));
	const std::pair<std::string, const char *> expected[] = {
		{photo, "2021-07-14 09:30:05"}, {png, ""}, {undated, ""}};
	for (const auto &[path, date] : expected) {
		ASSERT_EQ(media_content_scan_file(path.c_str()), MEDIA_DB_ERROR_NONE) << path;
		Media_Db_Row record = {};
		ASSERT_EQ(media_db_lookup(path.c_str(), &record), MEDIA_DB_ERROR_NONE) << path;
		EXPECT_STREQ(record.date_taken, date) << path;
	}
}
