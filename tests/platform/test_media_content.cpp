#include <media_content.h>
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string>
#include <sys/stat.h>
#include <vector>

#include "ie-test-harness.h"

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

// A real JPEG with an EXIF block carrying `orientation`, put right after
// the start-of-image marker.
Bytes jpeg_with_orientation(const std::string &dir, int w, int h, unsigned char orientation)
{
	std::string plain = dir + "/plain.jpg";
	EXPECT_TRUE(iet::write_picture(plain, w, h));
	Bytes jpeg = read_file(plain);
	Bytes app1 = {0xFF, 0xE1, 0x00, 34, 'E', 'x', 'i', 'f', 0, 0,
		      'I', 'I', 0x2A, 0x00, 0x08, 0x00, 0x00, 0x00,
		      0x01, 0x00,
		      0x12, 0x01, 0x03, 0x00, 0x01, 0x00, 0x00, 0x00, orientation, 0x00, 0x00, 0x00,
		      0x00, 0x00, 0x00, 0x00};
	return Bytes(jpeg.begin(), jpeg.begin() + 2) + app1 + Bytes(jpeg.begin() + 2, jpeg.end());
}

class MediaContent : public iet::EflTest {
protected:
	void SetUp() override
	{
		iet::EflTest::SetUp();
		dir = iet::temp_dir();
		db_path = dir + "/dbspace/new/.media.db";
		setenv("MEDIA_CONTENT_DB", db_path.c_str(), 1);
	}

	void expect_row(const std::string &path, const char *mime, int width, int height)
	{
		SCOPED_TRACE(path);
		media_content_record_s record = {};
		ASSERT_EQ(media_content_lookup(path.c_str(), &record), MEDIA_CONTENT_ERROR_NONE);
		struct stat st;
		ASSERT_EQ(stat(path.c_str(), &st), 0);
		EXPECT_STREQ(record.mime_type, mime);
		EXPECT_EQ(record.width, width);
		EXPECT_EQ(record.height, height);
		EXPECT_EQ(record.size, st.st_size);
		EXPECT_EQ(record.modified_time, st.st_mtime);
	}

	bool has_row(const std::string &path)
	{
		media_content_record_s record = {};
		return media_content_lookup(path.c_str(), &record) == MEDIA_CONTENT_ERROR_NONE;
	}

	std::string dir;
	std::string db_path;
};

} // namespace

TEST_F(MediaContent, ScanRecordsPicturesWithTheirPixelSize)
{
	std::string png = dir + "/a.png", jpg = dir + "/b.jpg", turned = dir + "/turned.jpg";
	ASSERT_TRUE(iet::write_picture(png, 40, 30));
	ASSERT_TRUE(iet::write_picture(jpg, 64, 48, "quality=90"));
	write_file(turned, jpeg_with_orientation(dir, 64, 48, 6));

	for (const std::string &path : {png, jpg, turned})
		EXPECT_EQ(media_content_scan_file(path.c_str()), MEDIA_CONTENT_ERROR_NONE) << path;
	expect_row(png, "image/png", 40, 30);
	expect_row(jpg, "image/jpeg", 64, 48);
	// Orientation 6 shows the picture a quarter turned.
	expect_row(turned, "image/jpeg", 48, 64);

	sqlite3 *db = nullptr;
	ASSERT_EQ(sqlite3_open_v2(db_path.c_str(), &db, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
	sqlite3_stmt *stmt = nullptr;
	sqlite3_prepare_v2(db, "PRAGMA journal_mode", -1, &stmt, nullptr);
	ASSERT_EQ(sqlite3_step(stmt), SQLITE_ROW);
	EXPECT_STREQ(reinterpret_cast<const char *>(sqlite3_column_text(stmt, 0)), "wal");
	sqlite3_finalize(stmt);
	sqlite3_close(db);
}

TEST_F(MediaContent, HandWrittenHeadersOfOtherFormats)
{
	struct Case {
		const char *name;
		Bytes bytes;
		const char *mime;
		int width, height;
	};
	Bytes bmp = {'B', 'M', 0, 0, 0, 0, 0, 0, 0, 0, 54, 0, 0, 0, 40, 0, 0, 0,
		     3, 0, 0, 0, 0xFE, 0xFF, 0xFF, 0xFF, 1, 0, 24, 0};
	bmp.resize(54 + 2 * 12);
	const Case cases[] = {
		{"anim.gif", {'G', 'I', 'F', '8', '9', 'a', 0x2C, 0x01, 0xC8, 0x00, 0x80, 0, 0, 0, 0, 0, 0xFF, 0xFF, 0xFF, 0x3B},
		 "image/gif", 300, 200},
		{"top-down.bmp", bmp, "image/bmp", 3, 2},
		// 200 x 2, one bit per pixel, rows of 25 bytes.
		{"mono.wbmp", Bytes{0, 0, 0x81, 0x48, 0x02} + Bytes(50, 0xFF), "image/vnd.wap.wbmp", 200, 2},
		{"clip.mp4", {0, 0, 0, 0x18, 'f', 't', 'y', 'p', 'i', 's', 'o', 'm', 0, 0, 2, 0}, "video/mp4", 0, 0},
		{"bare.mp3", {0xFF, 0xFB, 0x90, 0x64, 0, 0, 0, 0}, "audio/mpeg", 0, 0},
		{"beep.wav", {'R', 'I', 'F', 'F', 36, 0, 0, 0, 'W', 'A', 'V', 'E', 'f', 'm', 't', ' '}, "audio/x-wav", 0, 0},
	};
	for (const Case &c : cases) {
		std::string path = dir + "/" + c.name;
		write_file(path, c.bytes);
		EXPECT_EQ(media_content_scan_file(path.c_str()), MEDIA_CONTENT_ERROR_NONE) << c.name;
		expect_row(path, c.mime, c.width, c.height);
	}
}

TEST_F(MediaContent, RescanUpdatesTheRowFromTheContent)
{
	// The name says PNG; the content decides.
	std::string path = dir + "/changing.png";
	ASSERT_TRUE(iet::write_picture(path, 40, 30));
	ASSERT_EQ(media_content_scan_file(path.c_str()), MEDIA_CONTENT_ERROR_NONE);
	expect_row(path, "image/png", 40, 30);

	write_file(path, jpeg_with_orientation(dir, 20, 10, 1));
	ASSERT_EQ(media_content_scan_file(path.c_str()), MEDIA_CONTENT_ERROR_NONE);
	expect_row(path, "image/jpeg", 20, 10);
}

TEST_F(MediaContent, MissingNonMediaAndTruncatedFilesAreRefused)
{
	std::string png = dir + "/whole.png";
	ASSERT_TRUE(iet::write_picture(png, 40, 30));
	Bytes whole_png = read_file(png);
	Bytes jpeg = jpeg_with_orientation(dir, 16, 16, 1);

	std::string missing = dir + "/missing.jpg";
	std::string text = dir + "/notes.jpg", empty = dir + "/empty.png", short_png = dir + "/short.png";
	std::string no_frame = dir + "/no-frame.jpg", bad_wbmp = dir + "/bad.wbmp";
	write_file(text, {'h', 'e', 'l', 'l', 'o', '\n'});
	write_file(empty, {});
	write_file(short_png, Bytes(whole_png.begin(), whole_png.begin() + 16));
	write_file(no_frame, Bytes(jpeg.begin(), jpeg.begin() + 40));
	// Two zero bytes and a size that does not match the file length.
	write_file(bad_wbmp, {0, 0, 0x0A, 0x02, 0xFF});

	for (const std::string &path : {missing, dir, text, empty, short_png, no_frame, bad_wbmp}) {
		EXPECT_NE(media_content_scan_file(path.c_str()), MEDIA_CONTENT_ERROR_NONE) << path;
		EXPECT_FALSE(has_row(path)) << path;
	}
	EXPECT_EQ(media_content_scan_file(nullptr), MEDIA_CONTENT_ERROR_INVALID_PARAMETER);
	EXPECT_EQ(media_content_scan_file(""), MEDIA_CONTENT_ERROR_INVALID_PARAMETER);
}

TEST_F(MediaContent, ScanWorksThroughASharedConnection)
{
	std::string png = dir + "/a.png";
	ASSERT_TRUE(iet::write_picture(png, 8, 8));
	ASSERT_EQ(media_content_connect(), MEDIA_CONTENT_ERROR_NONE);
	EXPECT_EQ(media_content_scan_file(png.c_str()), MEDIA_CONTENT_ERROR_NONE);
	EXPECT_EQ(media_content_disconnect(), MEDIA_CONTENT_ERROR_NONE);
	expect_row(png, "image/png", 8, 8);
}
