/* Photographs with metadata, as a camera writes them, made with libexif;
 * and the header segments of a JPEG, to check what a save carried over. */
#ifndef IE_TEST_PHOTO_H
#define IE_TEST_PHOTO_H

#include <string>
#include <vector>

namespace iet {

/* What write_photo puts in the EXIF block. */
constexpr char kPhotoDateTaken[] = "2021:07:14 09:30:05";
constexpr char kPhotoMake[] = "Testcam";
constexpr char kPhotoModel[] = "T-100";

/* The colour profile write_photo embeds: `size` bytes of a fixed pattern. */
std::string test_icc_profile(size_t size = 70000);

/* write_picture's w x h gradient as a JPEG whose EXIF block follows the
 * start of image: date taken, make, model, exposure, GPS position, the
 * given orientation, a stale modification date and pixel size, and an
 * embedded thumbnail; then test_icc_profile() in APP2 segments (two, for
 * the default size). */
bool write_photo(const std::string &path, int w, int h, int orientation);

/* A marker segment before the first scan: its marker (0xE1 for APP1...)
 * and its data after the length field. */
struct Segment {
	int marker;
	std::string data;
};
std::vector<Segment> jpeg_segments(const std::string &path);
/* The ICC profile carried by a JPEG's APP2 segments, joined in order. */
std::string jpeg_icc_profile(const std::string &path);

/* Checks (as test expectations) that `path`, saved from a write_photo
 * source as a w x h picture no earlier than `saved_after`, carries the
 * source's date taken, make, model, exposure and GPS position, Orientation
 * 1, the saved pixel size, a modification date from the save, no
 * thumbnail, and the source's ICC profile. */
void expect_photo_metadata(const std::string &path, int w, int h, long saved_after);

} // namespace iet

#endif
