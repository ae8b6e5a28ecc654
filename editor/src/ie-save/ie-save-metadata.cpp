/* The photograph's metadata carried into the saved JPEG: its EXIF block and
 * its colour profile. The saved pixels are upright and edited, so the EXIF
 * block gets Orientation 1, the saved pixel size and the save's time as its
 * modification date, and loses its embedded thumbnail (the unedited
 * picture); every other tag stays as libexif read it, maker notes
 * included. The colour profile (ICC, in APP2 segments) is copied byte for
 * byte. A block that cannot be read or rebuilt is left out with a warning:
 * the picture matters more than its metadata. */
#include "ie-save-private.h"

#include <libexif/exif-data.h>
#include <libexif/exif-log.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "ie-debug.h"

namespace {

constexpr unsigned char MARKER = 0xFF;
constexpr unsigned char SOI = 0xD8;
constexpr unsigned char EOI = 0xD9;
constexpr unsigned char SOS = 0xDA;
constexpr unsigned char APP1 = 0xE1;
constexpr unsigned char APP2 = 0xE2;
/* A segment's length field counts itself: at most 65533 bytes of data. */
constexpr size_t SEGMENT_DATA_MAX = 0xFFFF - 2;
/* Header segments are read up to this much; past it the file is not a
 * photograph's header. */
constexpr size_t HEADER_BYTES_MAX = 16u << 20;
constexpr char EXIF_ID[] = "Exif\0";     // six bytes with the terminator
constexpr char ICC_ID[] = "ICC_PROFILE"; // twelve bytes with the terminator

struct Source_Segments {
	std::string exif;             /* APP1 data, from "Exif\0\0" on */
	std::vector<std::string> icc; /* whole APP2 segments, in file order */
};

struct FileCloser {
	void operator()(FILE *file) const { fclose(file); }
};
using File = std::unique_ptr<FILE, FileCloser>;

bool starts_with(const std::string &data, const char *id, size_t id_len)
{
	return data.size() >= id_len && memcmp(data.data(), id, id_len) == 0;
}

/* Reads the segments before the first scan of a JPEG. False when `path` is
 * not a regular file holding a JPEG. */
bool read_source_segments(const char *path, Source_Segments *out)
{
	// Never wait on something that is not a plain file.
	int fd = open(path, O_RDONLY | O_NONBLOCK | O_CLOEXEC);
	struct stat st;
	if (fd < 0 || fstat(fd, &st) != 0 || !S_ISREG(st.st_mode)) {
		if (fd >= 0)
			close(fd);
		return false;
	}
	File file(fdopen(fd, "rb"));
	if (!file) {
		close(fd);
		return false;
	}
	if (fgetc(file.get()) != MARKER || fgetc(file.get()) != SOI)
		return false;
	size_t header_bytes = 0;
	for (;;) {
		int c = fgetc(file.get());
		if (c != MARKER)
			return true;
		while (c == MARKER)
			c = fgetc(file.get());
		if (c == EOF || c == SOS || c == EOI)
			return true;
		if (c == 0x01 || (c >= 0xD0 && c <= 0xD7))
			continue;
		unsigned char length_bytes[2];
		if (fread(length_bytes, 1, 2, file.get()) != 2)
			return true;
		size_t length = static_cast<size_t>(length_bytes[0]) << 8 | length_bytes[1];
		if (length < 2)
			return true;
		size_t data_len = length - 2;
		header_bytes += length;
		if (header_bytes > HEADER_BYTES_MAX)
			return true;
		if (c != APP1 && c != APP2) {
			if (fseek(file.get(), static_cast<long>(data_len), SEEK_CUR) != 0)
				return true;
			continue;
		}
		std::string data(data_len, '\0');
		if (fread(&data[0], 1, data_len, file.get()) != data_len)
			return true;
		if (c == APP1 && out->exif.empty() && starts_with(data, EXIF_ID, sizeof(EXIF_ID)))
			out->exif = std::move(data);
		else if (c == APP2 && starts_with(data, ICC_ID, sizeof(ICC_ID)))
			out->icc.push_back(std::string{static_cast<char>(MARKER), static_cast<char>(APP2),
						       static_cast<char>(length_bytes[0]),
						       static_cast<char>(length_bytes[1])} +
					   data);
	}
}

struct ExifMemUnref {
	void operator()(ExifMem *mem) const { exif_mem_unref(mem); }
};
struct ExifDataUnref {
	void operator()(ExifData *data) const { exif_data_unref(data); }
};
struct ExifLogUnref {
	void operator()(ExifLog *log) const { exif_log_unref(log); }
};

void note_corrupt(ExifLog *, ExifLogCode code, const char *, const char *, va_list, void *data)
{
	if (code == EXIF_LOG_CODE_CORRUPT_DATA)
		*static_cast<bool *>(data) = true;
}

/* A fresh entry for `tag` in `ifd`, replacing any there, with room for
 * `components` values of `format`. Null when memory runs out. */
ExifEntry *replace_entry(ExifData *exif, ExifMem *mem, ExifIfd ifd, ExifTag tag, ExifFormat format,
			 unsigned long components)
{
	ExifContent *content = exif->ifd[ifd];
	if (ExifEntry *old = exif_content_get_entry(content, tag))
		exif_content_remove_entry(content, old);
	ExifEntry *entry = exif_entry_new_mem(mem);
	if (!entry)
		return nullptr;
	size_t size = exif_format_get_size(format) * components;
	entry->data = static_cast<unsigned char *>(exif_mem_alloc(mem, static_cast<ExifLong>(size)));
	if (!entry->data) {
		exif_entry_unref(entry);
		return nullptr;
	}
	entry->tag = tag;
	entry->format = format;
	entry->components = components;
	entry->size = static_cast<unsigned int>(size);
	exif_content_add_entry(content, entry);
	exif_entry_unref(entry);
	return entry;
}

bool set_long(ExifData *exif, ExifMem *mem, ExifIfd ifd, ExifTag tag, ExifLong value)
{
	ExifEntry *entry = replace_entry(exif, mem, ifd, tag, EXIF_FORMAT_LONG, 1);
	if (entry)
		exif_set_long(entry->data, exif_data_get_byte_order(exif), value);
	return entry != nullptr;
}

/* The APP1 segment for a picture of width x height saved at `now`, or ""
 * when the source's block cannot be read or rebuilt (logged). */
std::string updated_exif_segment(const char *source, const std::string &block, int width, int height, time_t now)
{
	std::unique_ptr<ExifMem, ExifMemUnref> mem(exif_mem_new_default());
	std::unique_ptr<ExifData, ExifDataUnref> exif(mem ? exif_data_new_mem(mem.get()) : nullptr);
	std::unique_ptr<ExifLog, ExifLogUnref> log(exif_log_new());
	if (!exif || !log) {
		IE_LOG_W("Cannot read the EXIF block of %s: %s; saving without it", source, strerror(ENOMEM));
		return {};
	}
	// Keep tags as they are: no dropping of unknown ones, no additions.
	exif_data_unset_option(exif.get(), EXIF_DATA_OPTION_IGNORE_UNKNOWN_TAGS);
	exif_data_unset_option(exif.get(), EXIF_DATA_OPTION_FOLLOW_SPECIFICATION);
	exif_data_set_option(exif.get(), EXIF_DATA_OPTION_DONT_CHANGE_MAKER_NOTE);
	bool corrupt = false;
	exif_log_set_func(log.get(), note_corrupt, &corrupt);
	exif_data_log(exif.get(), log.get());
	exif_data_load_data(exif.get(), reinterpret_cast<const unsigned char *>(block.data()),
			    static_cast<unsigned int>(block.size()));
	if (exif->ifd[EXIF_IFD_0]->count == 0) {
		IE_LOG_W("The EXIF block of %s is damaged; saving without it", source);
		return {};
	}
	if (corrupt)
		IE_LOG_W("The EXIF block of %s is partly damaged; keeping what could be read", source);

	ExifByteOrder order = exif_data_get_byte_order(exif.get());
	if (ExifEntry *orientation = exif_content_get_entry(exif->ifd[EXIF_IFD_0], EXIF_TAG_ORIENTATION)) {
		if (orientation->format == EXIF_FORMAT_SHORT && orientation->components >= 1 && orientation->size >= 2)
			exif_set_short(orientation->data, order, 1);
	}
	char date[20];
	struct tm local;
	strftime(date, sizeof(date), "%Y:%m:%d %H:%M:%S", localtime_r(&now, &local));
	ExifEntry *modified = replace_entry(exif.get(), mem.get(), EXIF_IFD_0, EXIF_TAG_DATE_TIME, EXIF_FORMAT_ASCII,
					    sizeof(date));
	bool updated = modified && set_long(exif.get(), mem.get(), EXIF_IFD_EXIF, EXIF_TAG_PIXEL_X_DIMENSION,
					    static_cast<ExifLong>(width)) &&
		       set_long(exif.get(), mem.get(), EXIF_IFD_EXIF, EXIF_TAG_PIXEL_Y_DIMENSION,
				static_cast<ExifLong>(height));
	if (modified)
		memcpy(modified->data, date, sizeof(date));

	ExifContent *thumbnail_ifd = exif->ifd[EXIF_IFD_1];
	while (thumbnail_ifd->count > 0)
		exif_content_remove_entry(thumbnail_ifd, thumbnail_ifd->entries[0]);
	if (exif->data) {
		exif_mem_free(mem.get(), exif->data);
		exif->data = nullptr;
		exif->size = 0;
	}

	unsigned char *saved = nullptr;
	unsigned int saved_len = 0;
	if (updated)
		exif_data_save_data(exif.get(), &saved, &saved_len);
	std::unique_ptr<unsigned char, void (*)(unsigned char *)> saved_owner(saved, [](unsigned char *p) { free(p); });
	if (!saved || saved_len == 0 || saved_len > SEGMENT_DATA_MAX) {
		IE_LOG_W("Cannot carry the EXIF block of %s over (%u bytes); saving without it", source, saved_len);
		return {};
	}
	size_t length = saved_len + 2;
	std::string segment{static_cast<char>(MARKER), static_cast<char>(APP1), static_cast<char>(length >> 8),
			    static_cast<char>(length & 0xFF)};
	segment.append(reinterpret_cast<const char *>(saved), saved_len);
	return segment;
}

} // namespace

std::string ie_save_metadata_segments(const char *source, int width, int height, time_t now)
{
	Source_Segments segments;
	if (!source || !source[0] || !read_source_segments(source, &segments))
		return {};
	std::string out;
	if (!segments.exif.empty())
		out = updated_exif_segment(source, segments.exif, width, height, now);
	for (const std::string &icc : segments.icc)
		out += icc;
	return out;
}
