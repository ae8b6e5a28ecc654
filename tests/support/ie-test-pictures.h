/* Test pictures made byte by byte: JPEGs carrying an EXIF orientation
 * (written with libexif) wherever the block sits, PNGs whose image data is
 * short, and the pixels a picture should show once turned upright. */
#ifndef IE_TEST_PICTURES_H
#define IE_TEST_PICTURES_H

#include <Evas.h>

#include <cstdint>
#include <string>
#include <vector>

namespace iet {

using Bytes = std::vector<uint8_t>;

Bytes read_bytes(const std::string &path);
bool write_bytes(const std::string &path, const Bytes &bytes);

/* A whole APP1 segment holding an EXIF block with one tag, the
 * orientation, in little- or big-endian byte order. */
Bytes exif_segment(int orientation, bool big_endian);
/* A whole COM segment. */
Bytes comment_segment(const std::string &text);
/* `jpeg` with `segments` inserted right after the start-of-image marker,
 * or after its JFIF segment when `after_jfif`. */
Bytes jpeg_with_segments(const Bytes &jpeg, const std::vector<Bytes> &segments, bool after_jfif);

/* write_picture's w x h JPEG stored in `orientation`: the EXIF block comes
 * first, or (`comment_first`) after the JFIF segment and a comment, the way
 * common image editors write it; baseline or progressive. */
bool write_oriented_jpeg(const std::string &path, int w, int h, int orientation, bool big_endian,
			 bool comment_first, bool progressive = false);

/* write_picture's w x h picture as a progressive JPEG (quality 95). */
bool write_progressive_jpeg(const std::string &path, int w, int h);

/* write_picture's PNG with only the first half of its compressed image
 * data, in chunks that are whole and correct: nothing shows the damage
 * before the data is decoded. */
bool write_png_with_short_data(const std::string &path, int w, int h);

struct Pixels {
	int w = 0, h = 0;
	std::vector<uint32_t> data;
	bool operator==(const Pixels &o) const { return w == o.w && h == o.h && data == o.data; }
};

/* The file's pixels as stored, with no orientation applied. */
Pixels stored_pixels(const std::string &path);
/* The pixels of an Evas image object. */
Pixels image_pixels(Evas_Object *image);
/* `stored` shown as EXIF `orientation` says: each stored pixel is carried to
 * its upright place (the mark at the stored top left goes to the top right
 * for 2 and 6, the bottom right for 3 and 7, the bottom left for 4 and 8). */
Pixels turned_upright(const Pixels &stored, int orientation);
/* The largest difference of a colour channel between the mean colours of
 * matching cells of a `cells` x `cells` grid laid over both pictures, whose
 * sizes may differ: small for the same picture scaled or compressed, large
 * for one mirrored or turned. */
int grid_difference(const Pixels &a, const Pixels &b, int cells = 6);

} // namespace iet

#endif
