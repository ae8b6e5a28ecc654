#include "ie-test-photo.h"

#include <libexif/exif-data.h>

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fstream>
#include <iterator>

#include "ie-test-harness.h"

namespace iet {

namespace {

std::string read_file(const std::string &path)
{
	std::ifstream in(path, std::ios::binary);
	return {std::istreambuf_iterator<char>(in), {}};
}

std::string segment(int marker, const std::string &data)
{
	size_t length = data.size() + 2;
	return std::string{'\xFF', static_cast<char>(marker), static_cast<char>(length >> 8),
			   static_cast<char>(length & 0xFF)} +
	       data;
}

ExifEntry *add_entry(ExifData *exif, ExifIfd ifd, ExifTag tag, ExifFormat format, unsigned long components)
{
	ExifEntry *entry = exif_entry_new();
	entry->tag = tag;
	entry->format = format;
	entry->components = components;
	entry->size = exif_format_get_size(format) * components;
	entry->data = static_cast<unsigned char *>(calloc(1, entry->size));
	exif_content_add_entry(exif->ifd[ifd], entry);
	exif_entry_unref(entry);
	return entry;
}

void add_text(ExifData *exif, ExifIfd ifd, ExifTag tag, const char *text)
{
	ExifEntry *entry = add_entry(exif, ifd, tag, EXIF_FORMAT_ASCII, strlen(text) + 1);
	memcpy(entry->data, text, strlen(text) + 1);
}

void add_rationals(ExifData *exif, ExifIfd ifd, ExifTag tag, std::initializer_list<ExifRational> values)
{
	ExifEntry *entry = add_entry(exif, ifd, tag, EXIF_FORMAT_RATIONAL, values.size());
	size_t at = 0;
	for (const ExifRational &value : values)
		exif_set_rational(entry->data + 8 * at++, exif_data_get_byte_order(exif), value);
}

/* The APP1 data of a camera's EXIF block with `thumbnail` embedded. */
std::string exif_block(int w, int h, int orientation, const std::string &thumbnail)
{
	ExifData *exif = exif_data_new();
	exif_data_unset_option(exif, EXIF_DATA_OPTION_FOLLOW_SPECIFICATION);
	exif_data_set_byte_order(exif, EXIF_BYTE_ORDER_INTEL);
	ExifByteOrder order = EXIF_BYTE_ORDER_INTEL;
	add_text(exif, EXIF_IFD_0, EXIF_TAG_MAKE, kPhotoMake);
	add_text(exif, EXIF_IFD_0, EXIF_TAG_MODEL, kPhotoModel);
	exif_set_short(add_entry(exif, EXIF_IFD_0, EXIF_TAG_ORIENTATION, EXIF_FORMAT_SHORT, 1)->data, order,
		       static_cast<ExifShort>(orientation));
	add_text(exif, EXIF_IFD_0, EXIF_TAG_DATE_TIME, "2021:07:15 18:00:00");
	add_text(exif, EXIF_IFD_EXIF, EXIF_TAG_DATE_TIME_ORIGINAL, kPhotoDateTaken);
	add_rationals(exif, EXIF_IFD_EXIF, EXIF_TAG_EXPOSURE_TIME, {{1, 250}});
	exif_set_short(add_entry(exif, EXIF_IFD_EXIF, EXIF_TAG_PIXEL_X_DIMENSION, EXIF_FORMAT_SHORT, 1)->data, order,
		       static_cast<ExifShort>(w));
	exif_set_short(add_entry(exif, EXIF_IFD_EXIF, EXIF_TAG_PIXEL_Y_DIMENSION, EXIF_FORMAT_SHORT, 1)->data, order,
		       static_cast<ExifShort>(h));
	add_text(exif, EXIF_IFD_GPS, static_cast<ExifTag>(EXIF_TAG_GPS_LATITUDE_REF), "N");
	add_rationals(exif, EXIF_IFD_GPS, static_cast<ExifTag>(EXIF_TAG_GPS_LATITUDE), {{48, 1}, {8, 1}, {3030, 100}});
	add_text(exif, EXIF_IFD_GPS, static_cast<ExifTag>(EXIF_TAG_GPS_LONGITUDE_REF), "E");
	add_rationals(exif, EXIF_IFD_GPS, static_cast<ExifTag>(EXIF_TAG_GPS_LONGITUDE), {{11, 1}, {34, 1}, {1515, 100}});
	exif->data = static_cast<unsigned char *>(malloc(thumbnail.size()));
	memcpy(exif->data, thumbnail.data(), thumbnail.size());
	exif->size = static_cast<unsigned int>(thumbnail.size());

	unsigned char *saved = nullptr;
	unsigned int saved_len = 0;
	exif_data_save_data(exif, &saved, &saved_len);
	std::string block(reinterpret_cast<const char *>(saved), saved_len);
	free(saved);
	exif_data_unref(exif);
	return block;
}

} // namespace

std::string test_icc_profile(size_t size)
{
	std::string profile(size, '\0');
	for (size_t i = 0; i < size; i++)
		profile[i] = static_cast<char>((i * 131 + i / 251) & 0xFF);
	return profile;
}

bool write_photo(const std::string &path, int w, int h, int orientation)
{
	std::string thumbnail_path = path + ".thumb.jpg";
	if (!write_picture(thumbnail_path, 16, 12) || !write_picture(path, w, h, "quality=95"))
		return false;
	std::string thumbnail = read_file(thumbnail_path);
	remove(thumbnail_path.c_str());
	std::string jpeg = read_file(path);

	std::string header = segment(0xE1, exif_block(w, h, orientation, thumbnail));
	// An ICC profile goes in numbered chunks of at most 65519 bytes.
	std::string profile = test_icc_profile();
	constexpr size_t chunk = 65519;
	size_t count = (profile.size() + chunk - 1) / chunk;
	for (size_t i = 0; i < count; i++)
		header += segment(0xE2, std::string("ICC_PROFILE\0", 12) + static_cast<char>(i + 1) +
						 static_cast<char>(count) + profile.substr(i * chunk, chunk));
	std::ofstream(path, std::ios::binary) << jpeg.substr(0, 2) << header << jpeg.substr(2);
	return true;
}

std::vector<Segment> jpeg_segments(const std::string &path)
{
	std::string jpeg = read_file(path);
	std::vector<Segment> segments;
	auto byte = [&jpeg](size_t at) { return static_cast<unsigned char>(jpeg[at]); };
	size_t at = 2;
	while (at + 4 <= jpeg.size() && byte(at) == 0xFF && byte(at + 1) != 0xDA) {
		size_t length = static_cast<size_t>(byte(at + 2)) << 8 | byte(at + 3);
		if (length < 2 || at + 2 + length > jpeg.size())
			break;
		segments.push_back({byte(at + 1), jpeg.substr(at + 4, length - 2)});
		at += 2 + length;
	}
	return segments;
}

std::string jpeg_icc_profile(const std::string &path)
{
	std::string profile;
	for (const Segment &s : jpeg_segments(path))
		if (s.marker == 0xE2 && s.data.compare(0, 12, std::string("ICC_PROFILE\0", 12)) == 0)
			profile += s.data.substr(14);
	return profile;
}

namespace {

std::string entry_bytes(ExifData *exif, ExifIfd ifd, int tag)
{
	ExifEntry *entry = exif_content_get_entry(exif->ifd[ifd], static_cast<ExifTag>(tag));
	return entry ? std::string(reinterpret_cast<const char *>(entry->data), entry->size) : "<none>";
}

long entry_number(ExifData *exif, ExifIfd ifd, ExifTag tag)
{
	ExifEntry *entry = exif_content_get_entry(exif->ifd[ifd], tag);
	if (!entry)
		return -1;
	ExifByteOrder order = exif_data_get_byte_order(exif);
	if (entry->format == EXIF_FORMAT_SHORT)
		return exif_get_short(entry->data, order);
	if (entry->format == EXIF_FORMAT_LONG)
		return static_cast<long>(exif_get_long(entry->data, order));
	return -2;
}

} // namespace

void expect_photo_metadata(const std::string &path, int w, int h, long saved_after)
{
	SCOPED_TRACE(path);
	std::string source = path + ".reference.jpg";
	ASSERT_TRUE(write_photo(source, w, h, 6));
	ExifData *saved = exif_data_new_from_file(path.c_str());
	ExifData *reference = exif_data_new_from_file(source.c_str());
	remove(source.c_str());
	ASSERT_NE(saved, nullptr) << "no EXIF block";
	ASSERT_NE(reference, nullptr);

	const std::pair<ExifIfd, int> kept[] = {
		{EXIF_IFD_0, EXIF_TAG_MAKE},
		{EXIF_IFD_0, EXIF_TAG_MODEL},
		{EXIF_IFD_EXIF, EXIF_TAG_DATE_TIME_ORIGINAL},
		{EXIF_IFD_EXIF, EXIF_TAG_EXPOSURE_TIME},
		{EXIF_IFD_GPS, EXIF_TAG_GPS_LATITUDE_REF},
		{EXIF_IFD_GPS, EXIF_TAG_GPS_LATITUDE},
		{EXIF_IFD_GPS, EXIF_TAG_GPS_LONGITUDE_REF},
		{EXIF_IFD_GPS, EXIF_TAG_GPS_LONGITUDE},
	};
	for (const auto &[ifd, tag] : kept)
		EXPECT_EQ(entry_bytes(saved, ifd, tag), entry_bytes(reference, ifd, tag)) << "tag " << tag;
	EXPECT_EQ(entry_bytes(saved, EXIF_IFD_EXIF, EXIF_TAG_DATE_TIME_ORIGINAL), std::string(kPhotoDateTaken, 20));
	EXPECT_EQ(entry_number(saved, EXIF_IFD_0, EXIF_TAG_ORIENTATION), 1);
	EXPECT_EQ(entry_number(saved, EXIF_IFD_EXIF, EXIF_TAG_PIXEL_X_DIMENSION), w);
	EXPECT_EQ(entry_number(saved, EXIF_IFD_EXIF, EXIF_TAG_PIXEL_Y_DIMENSION), h);

	std::string modified = entry_bytes(saved, EXIF_IFD_0, EXIF_TAG_DATE_TIME);
	struct tm when = {};
	ASSERT_NE(strptime(modified.c_str(), "%Y:%m:%d %H:%M:%S", &when), nullptr) << modified;
	when.tm_isdst = -1;
	long stamp = static_cast<long>(mktime(&when));
	EXPECT_GE(stamp, saved_after - 1) << modified;
	EXPECT_LE(stamp, static_cast<long>(time(nullptr)) + 1) << modified;

	EXPECT_EQ(saved->data, nullptr) << "the thumbnail showed the unedited picture";
	EXPECT_EQ(saved->ifd[EXIF_IFD_1]->count, 0u);
	exif_data_unref(saved);
	exif_data_unref(reference);
	EXPECT_TRUE(jpeg_icc_profile(path) == test_icc_profile()) << "the colour profile, byte for byte";
}

} // namespace iet
