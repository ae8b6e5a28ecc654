#include "media_db.h"

#include <libexif/exif-data.h>
#include <sqlite3.h>
#include <libexif/exif-data.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <filesystem>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr char default_db_path[] = "/var/lib/editor-svc-platform/media.db";
constexpr int default_busy_timeout_ms = 5000;

constexpr char schema[] =
	"CREATE TABLE IF NOT EXISTS media ("
	" path TEXT PRIMARY KEY NOT NULL,"
	" mime_type TEXT NOT NULL,"
	" size INTEGER NOT NULL,"
	" width INTEGER NOT NULL,"
	" height INTEGER NOT NULL,"
	" modified_time INTEGER NOT NULL,"
	" date_taken TEXT)";

/* ---- Content sniffing ------------------------------------------------ */

struct FileCloser {
	void operator()(FILE *file) const { fclose(file); }
};
using File = std::unique_ptr<FILE, FileCloser>;

struct MediaInfo {
	const char *mime = nullptr;
	int width = 0;
	int height = 0;
};

enum class Sniff { media, not_media, broken };

uint16_t be16(const unsigned char *p) { return static_cast<uint16_t>(p[0] << 8 | p[1]); }
uint16_t le16(const unsigned char *p) { return static_cast<uint16_t>(p[1] << 8 | p[0]); }
uint32_t be32(const unsigned char *p)
{
	return static_cast<uint32_t>(p[0]) << 24 | static_cast<uint32_t>(p[1]) << 16 |
	       static_cast<uint32_t>(p[2]) << 8 | p[3];
}
uint32_t le32(const unsigned char *p)
{
	return static_cast<uint32_t>(p[3]) << 24 | static_cast<uint32_t>(p[2]) << 16 |
	       static_cast<uint32_t>(p[1]) << 8 | p[0];
}

bool read_exact(FILE *file, unsigned char *buf, size_t len)
{
	return fread(buf, 1, len, file) == len;
}

struct ExifUnref {
	void operator()(ExifData *data) const { exif_data_unref(data); }
};

// Orientation (tag 0x0112) of IFD0 in an EXIF block, read with libexif as
// written (no tags filled in); 1 when absent or unreadable.
int exif_orientation(const unsigned char *exif, size_t len)
{
	if (len < 6 || memcmp(exif, "Exif\0\0", 6) != 0)
		return 1;
	std::unique_ptr<ExifData, ExifUnref> data(exif_data_new());
	if (!data)
		return 1;
	exif_data_unset_option(data.get(), EXIF_DATA_OPTION_FOLLOW_SPECIFICATION);
	exif_data_load_data(data.get(), exif, static_cast<unsigned int>(len));
	ExifEntry *entry = exif_content_get_entry(data->ifd[EXIF_IFD_0], EXIF_TAG_ORIENTATION);
	if (!entry || entry->format != EXIF_FORMAT_SHORT || entry->components < 1 || entry->size < 2)
		return 1;
	int value = exif_get_short(entry->data, exif_data_get_byte_order(data.get()));
	return (value >= 1 && value <= 8) ? value : 1;
}

// Walks the marker segments up to the first frame header. Orientations
// 5 to 8 turn the picture a quarter, so its shown size is swapped.
Sniff sniff_jpeg(FILE *file, MediaInfo *info)
{
	int orientation = 1;
	bool exif_seen = false; // the first EXIF block counts, wherever it sits
	for (;;) {
		int c = fgetc(file);
		if (c != 0xFF)
			return Sniff::broken;
		do
			c = fgetc(file);
		while (c == 0xFF);
		if (c == EOF)
			return Sniff::broken;
		int marker = c;
		if (marker == 0x01 || (marker >= 0xD0 && marker <= 0xD7))
			continue;
		if (marker == 0xD9 || marker == 0xDA)
			return Sniff::broken; // scan data or end before any frame header
		unsigned char length_bytes[2];
		if (!read_exact(file, length_bytes, 2))
			return Sniff::broken;
		unsigned length = be16(length_bytes);
		if (length < 2)
			return Sniff::broken;
		size_t body = length - 2;
		bool frame = marker >= 0xC0 && marker <= 0xCF && marker != 0xC4 && marker != 0xC8 &&
			     marker != 0xCC;
		if (frame) {
			unsigned char sof[5];
			if (body < 5 || !read_exact(file, sof, 5))
				return Sniff::broken;
			int height = be16(sof + 1), width = be16(sof + 3);
			if (width == 0 || height == 0)
				return Sniff::broken;
			bool quarter_turn = orientation >= 5 && orientation <= 8;
			info->mime = "image/jpeg";
			info->width = quarter_turn ? height : width;
			info->height = quarter_turn ? width : height;
			return Sniff::media;
		}
		if (marker == 0xE1 && !exif_seen) {
			std::unique_ptr<unsigned char[]> app1(new unsigned char[body]);
			if (!read_exact(file, app1.get(), body))
				return Sniff::broken;
			exif_seen = body >= 6 && memcmp(app1.get(), "Exif\0\0", 6) == 0;
			orientation = exif_orientation(app1.get(), body);
			continue;
		}
		if (fseek(file, static_cast<long>(body), SEEK_CUR) != 0)
			return Sniff::broken;
	}
}

// WBMP has no magic number: besides its two zero bytes, the file must be
// exactly as long as the size in its header says.
Sniff sniff_wbmp(const unsigned char *head, size_t len, long long file_size, MediaInfo *info)
{
	size_t pos = 2;
	auto read_multibyte = [&](uint32_t *value) {
		*value = 0;
		for (int i = 0; i < 4 && pos < len; i++) {
			unsigned char byte = head[pos++];
			*value = (*value << 7) | (byte & 0x7F);
			if (!(byte & 0x80))
				return true;
		}
		return false;
	};
	uint32_t width, height;
	if (!read_multibyte(&width) || !read_multibyte(&height) || width == 0 || height == 0)
		return Sniff::not_media;
	long long expected = static_cast<long long>(pos) + (static_cast<long long>(width) + 7) / 8 * height;
	if (expected != file_size)
		return Sniff::not_media;
	info->mime = "image/vnd.wap.wbmp";
	info->width = static_cast<int>(width);
	info->height = static_cast<int>(height);
	return Sniff::media;
}

bool is_mp3_frame(const unsigned char *p)
{
	return p[0] == 0xFF && (p[1] & 0xE0) == 0xE0 && (p[1] & 0x06) != 0 && (p[2] & 0xF0) != 0xF0 &&
	       (p[2] & 0x0C) != 0x0C;
}

Sniff sniff(FILE *file, long long file_size, MediaInfo *info)
{
	unsigned char head[32] = {};
	size_t len = fread(head, 1, sizeof(head), file);

	if (len >= 3 && head[0] == 0xFF && head[1] == 0xD8 && head[2] == 0xFF) {
		if (fseek(file, 2, SEEK_SET) != 0)
			return Sniff::broken;
		return sniff_jpeg(file, info);
	}
	if (len >= 8 && memcmp(head, "\x89PNG\r\n\x1a\n", 8) == 0) {
		if (len < 24 || memcmp(head + 12, "IHDR", 4) != 0)
			return Sniff::broken;
		uint32_t width = be32(head + 16), height = be32(head + 20);
		if (width == 0 || height == 0 || width > INT32_MAX || height > INT32_MAX)
			return Sniff::broken;
		*info = {"image/png", static_cast<int>(width), static_cast<int>(height)};
		return Sniff::media;
	}
	if (len >= 6 && (memcmp(head, "GIF87a", 6) == 0 || memcmp(head, "GIF89a", 6) == 0)) {
		if (len < 10 || le16(head + 6) == 0 || le16(head + 8) == 0)
			return Sniff::broken;
		*info = {"image/gif", le16(head + 6), le16(head + 8)};
		return Sniff::media;
	}
	if (len >= 2 && head[0] == 'B' && head[1] == 'M') {
		if (len < 26)
			return Sniff::broken;
		uint32_t dib_size = le32(head + 14);
		long long width, height;
		if (dib_size == 12) {
			width = le16(head + 18);
			height = le16(head + 20);
		} else if (dib_size >= 40) {
			width = static_cast<int32_t>(le32(head + 18));
			height = static_cast<int32_t>(le32(head + 22));
		} else {
			return Sniff::broken;
		}
		if (height < 0)
			height = -height; // top-down rows
		if (width <= 0 || height == 0 || width > INT32_MAX || height > INT32_MAX)
			return Sniff::broken;
		*info = {"image/bmp", static_cast<int>(width), static_cast<int>(height)};
		return Sniff::media;
	}
	if (len >= 12 && memcmp(head + 4, "ftyp", 4) == 0) {
		if (memcmp(head + 8, "qt  ", 4) == 0)
			info->mime = "video/quicktime";
		else if (memcmp(head + 8, "M4A ", 4) == 0)
			info->mime = "audio/mp4";
		else if (memcmp(head + 8, "3gp", 3) == 0)
			info->mime = "video/3gpp";
		else
			info->mime = "video/mp4";
		return Sniff::media;
	}
	if (len >= 12 && memcmp(head, "RIFF", 4) == 0 && memcmp(head + 8, "WAVE", 4) == 0) {
		info->mime = "audio/x-wav";
		return Sniff::media;
	}
	if (len >= 4 && memcmp(head, "OggS", 4) == 0) {
		info->mime = "audio/ogg";
		return Sniff::media;
	}
	if ((len >= 3 && memcmp(head, "ID3", 3) == 0) || (len >= 4 && is_mp3_frame(head))) {
		info->mime = "audio/mpeg";
		return Sniff::media;
	}
	if (len >= 4 && head[0] == 0 && head[1] == 0)
		return sniff_wbmp(head, len, file_size, info);
	return Sniff::not_media;
}

struct ExifDataUnref {
	void operator()(ExifData *data) const { exif_data_unref(data); }
};

// DateTimeOriginal of a photograph's EXIF block as "YYYY-MM-DD HH:MM:SS",
// or "" when it has none or it is not a date.
std::string exif_date_taken(const char *path)
{
	std::unique_ptr<ExifData, ExifDataUnref> exif(exif_data_new_from_file(path));
	ExifEntry *entry = exif ? exif_content_get_entry(exif->ifd[EXIF_IFD_EXIF], EXIF_TAG_DATE_TIME_ORIGINAL)
				: nullptr;
	constexpr char shape[] = "dddd:dd:dd dd:dd:dd";
	constexpr size_t len = sizeof(shape) - 1;
	if (!entry || entry->format != EXIF_FORMAT_ASCII || entry->size < len)
		return {};
	std::string date(reinterpret_cast<const char *>(entry->data), len);
	for (size_t i = 0; i < len; i++) {
		bool digit = date[i] >= '0' && date[i] <= '9';
		if (shape[i] == 'd' ? !digit : date[i] != shape[i])
			return {};
	}
	date[4] = date[7] = '-';
	return date;
}

/* ---- Database -------------------------------------------------------- */

struct DbCloser {
	void operator()(sqlite3 *db) const { sqlite3_close(db); }
};
using Db = std::unique_ptr<sqlite3, DbCloser>;

struct StmtFinalizer {
	void operator()(sqlite3_stmt *stmt) const { sqlite3_finalize(stmt); }
};
using Stmt = std::unique_ptr<sqlite3_stmt, StmtFinalizer>;

// The connection opened by media_db_open, shared until the last
// disconnect; calls made without one open a connection of their own.
Db shared_db;
int connect_count;

std::string db_path()
{
	const char *path = getenv("MEDIA_DB_PATH");
	return (path && *path) ? path : default_db_path;
}

bool make_directories(const std::string &dir)
{
	std::error_code error;
	return dir.empty() || std::filesystem::create_directories(dir, error) || std::filesystem::is_directory(dir, error);
}

int db_error(int sqlite_result)
{
	int primary = sqlite_result & 0xFF;
	if (primary == SQLITE_BUSY || primary == SQLITE_LOCKED)
		return MEDIA_DB_ERROR_DB_BUSY;
	if (primary == SQLITE_FULL)
		return MEDIA_DB_ERROR_NO_SPACE;
	if (primary == SQLITE_NOMEM)
		return MEDIA_DB_ERROR_OUT_OF_MEMORY;
	if (primary == SQLITE_PERM || primary == SQLITE_READONLY)
		return MEDIA_DB_ERROR_PERMISSION_DENIED;
	return MEDIA_DB_ERROR_DB_FAILED;
}

int busy_timeout()
{
	const char *value = getenv("MEDIA_DB_BUSY_TIMEOUT_MS");
	char *end = nullptr;
	long ms = value ? strtol(value, &end, 10) : -1;
	return (value && *value && !*end && ms >= 0 && ms <= INT32_MAX) ? static_cast<int>(ms) : default_busy_timeout_ms;
}

// Databases made before the date taken was recorded get its column.
int add_date_taken_column(sqlite3 *db)
{
	sqlite3_stmt *raw = nullptr;
	int rc = sqlite3_prepare_v2(db, "SELECT date_taken FROM media LIMIT 0", -1, &raw, nullptr);
	sqlite3_finalize(raw);
	if (rc == SQLITE_OK)
		return SQLITE_OK;
	return sqlite3_exec(db, "ALTER TABLE media ADD COLUMN date_taken TEXT", nullptr, nullptr, nullptr);
}

int open_db(Db *out)
{
	std::string path = db_path();
	size_t slash = path.find_last_of('/');
	if (slash != std::string::npos && !make_directories(path.substr(0, slash)))
		return MEDIA_DB_ERROR_DB_FAILED;
	sqlite3 *raw = nullptr;
	int rc = sqlite3_open_v2(path.c_str(), &raw, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr);
	Db db(raw);
	if (rc != SQLITE_OK)
		return db_error(rc);
	sqlite3_busy_timeout(db.get(), busy_timeout());
	rc = sqlite3_exec(db.get(), "PRAGMA journal_mode=WAL", nullptr, nullptr, nullptr);
	if (rc == SQLITE_OK)
		rc = sqlite3_exec(db.get(), schema, nullptr, nullptr, nullptr);
	if (rc == SQLITE_OK)
		rc = add_date_taken_column(db.get());
	if (rc != SQLITE_OK)
		return db_error(rc);
	*out = std::move(db);
	return MEDIA_DB_ERROR_NONE;
}

// The shared connection when connected, else `local` freshly opened.
int use_db(Db *local, sqlite3 **db)
{
	if (shared_db) {
		*db = shared_db.get();
		return MEDIA_DB_ERROR_NONE;
	}
	int result = open_db(local);
	*db = local->get();
	return result;
}

// Rows are keyed by canonical absolute path, so that one file has one row
// however it is named; a relative path is taken from the working
// directory, the way the caller meant it. A path that does not resolve
// (a file since removed) is made absolute and normalised as text.
bool canonical_path(const char *path, std::string *out)
{
	if (!path || !*path)
		return false;
	if (char *resolved = realpath(path, nullptr)) {
		*out = resolved;
		free(resolved);
		return true;
	}
	std::error_code error;
	std::filesystem::path absolute = std::filesystem::absolute(path, error);
	if (error)
		return false;
	*out = absolute.lexically_normal().string();
	return true;
}

} // namespace

extern "C" int media_db_open(void)
{
	if (connect_count == 0) {
		int result = open_db(&shared_db);
		if (result != MEDIA_DB_ERROR_NONE)
			return result;
	}
	connect_count++;
	return MEDIA_DB_ERROR_NONE;
}

extern "C" int media_db_close(void)
{
	if (connect_count == 0)
		return MEDIA_DB_ERROR_INVALID_OPERATION;
	if (--connect_count == 0)
		shared_db.reset();
	return MEDIA_DB_ERROR_NONE;
}

extern "C" int media_content_scan_file(const char *path)
{
	std::string full_path;
	if (!canonical_path(path, &full_path))
		return MEDIA_DB_ERROR_INVALID_PARAMETER;

	File file(fopen(full_path.c_str(), "rb"));
	if (!file)
		return errno == EACCES ? MEDIA_DB_ERROR_PERMISSION_DENIED : MEDIA_DB_ERROR_INVALID_PARAMETER;
	struct stat st;
	if (fstat(fileno(file.get()), &st) != 0 || !S_ISREG(st.st_mode))
		return MEDIA_DB_ERROR_INVALID_PARAMETER;
	MediaInfo info;
	if (sniff(file.get(), st.st_size, &info) != Sniff::media)
		return MEDIA_DB_ERROR_INVALID_PARAMETER;
	file.reset();
	std::string date_taken = strcmp(info.mime, "image/jpeg") == 0 ? exif_date_taken(full_path.c_str()) : "";

	Db local;
	sqlite3 *db;
	int result = use_db(&local, &db);
	if (result != MEDIA_DB_ERROR_NONE)
		return result;
	sqlite3_stmt *raw = nullptr;
	int rc = sqlite3_prepare_v2(db,
		"INSERT INTO media (path, mime_type, size, width, height, modified_time, date_taken)"
		" VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7)"
		" ON CONFLICT (path) DO UPDATE SET mime_type = ?2, size = ?3, width = ?4,"
		" height = ?5, modified_time = ?6, date_taken = ?7",
		-1, &raw, nullptr);
	Stmt insert(raw);
	if (rc != SQLITE_OK)
		return db_error(rc);
	sqlite3_bind_text(raw, 1, full_path.c_str(), -1, SQLITE_TRANSIENT);
	sqlite3_bind_text(raw, 2, info.mime, -1, SQLITE_STATIC);
	sqlite3_bind_int64(raw, 3, st.st_size);
	sqlite3_bind_int(raw, 4, info.width);
	sqlite3_bind_int(raw, 5, info.height);
	sqlite3_bind_int64(raw, 6, st.st_mtime);
	if (!date_taken.empty())
		sqlite3_bind_text(raw, 7, date_taken.c_str(), -1, SQLITE_TRANSIENT);
	rc = sqlite3_step(raw);
	return rc == SQLITE_DONE ? MEDIA_DB_ERROR_NONE : db_error(rc);
}

extern "C" int media_db_lookup(const char *path, Media_Db_Row *record)
{
	std::string full_path;
	if (!record || !canonical_path(path, &full_path))
		return MEDIA_DB_ERROR_INVALID_PARAMETER;

	Db local;
	sqlite3 *db;
	int result = use_db(&local, &db);
	if (result != MEDIA_DB_ERROR_NONE)
		return result;
	sqlite3_stmt *raw = nullptr;
	int rc = sqlite3_prepare_v2(db,
		"SELECT mime_type, size, width, height, modified_time, date_taken FROM media WHERE path = ?1",
		-1, &raw, nullptr);
	Stmt select(raw);
	if (rc != SQLITE_OK)
		return db_error(rc);
	sqlite3_bind_text(raw, 1, full_path.c_str(), -1, SQLITE_TRANSIENT);
	rc = sqlite3_step(raw);
	if (rc == SQLITE_DONE)
		return MEDIA_DB_ERROR_INVALID_OPERATION;
	if (rc != SQLITE_ROW)
		return db_error(rc);
	const unsigned char *mime = sqlite3_column_text(raw, 0);
	snprintf(record->mime_type, sizeof(record->mime_type), "%s", mime ? reinterpret_cast<const char *>(mime) : "");
	record->size = sqlite3_column_int64(raw, 1);
	record->width = sqlite3_column_int(raw, 2);
	record->height = sqlite3_column_int(raw, 3);
	record->modified_time = sqlite3_column_int64(raw, 4);
	const unsigned char *date_taken = sqlite3_column_text(raw, 5);
	snprintf(record->date_taken, sizeof(record->date_taken), "%s",
		 date_taken ? reinterpret_cast<const char *>(date_taken) : "");
	return MEDIA_DB_ERROR_NONE;
}
