/* Picture files the loading tests need and Evas cannot save: GIF, WBMP, a
 * JPEG with an EXIF orientation, a header claiming an enormous picture. */
#ifndef IE_TEST_IMAGE_FILES_H
#define IE_TEST_IMAGE_FILES_H

#include <cstdint>
#include <string>

namespace iet {

/* One-colour GIF of w x h (palette entry 0 = rgb). */
bool write_flat_gif(const std::string &path, int w, int h, uint32_t rgb);
/* WBMP of w x h: the left half white, the right half black. */
bool write_half_wbmp(const std::string &path, int w, int h);
/* Puts an EXIF APP1 segment with the given orientation into a JPEG. */
bool add_exif_orientation(const std::string &jpeg_path, int orientation);
/* A PNG whose header claims w x h, with no pixel data. */
bool write_png_header_only(const std::string &path, uint32_t w, uint32_t h);
/* Keeps the first `fraction` of a file's bytes. */
bool truncate_file(const std::string &path, double fraction);
bool write_text_file(const std::string &path, const std::string &text);

} // namespace iet

#endif
