/* What reads a picture's header by its path: the EXIF and colour profile
 * copied on save, and the media database's scan (the orientation among
 * them). The input goes to a file of its own. */
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "ie-save-private.h"
#include "media_db.h"

namespace {

std::string scratch_dir()
{
	static char dir[] = "/tmp/ie-fuzz-metadata.XXXXXX";
	if (!mkdtemp(dir))
		abort();
	atexit([] { std::filesystem::remove_all(dir); });
	return dir;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
	static const std::string dir = scratch_dir();
	static const std::string picture = dir + "/picture.jpg";
	static const bool db_set = setenv("MEDIA_DB_PATH", (dir + "/media.db").c_str(), 1) == 0;
	(void)db_set;
	FILE *file = fopen(picture.c_str(), "wb");
	if (!file || fwrite(data, 1, size, file) != size || fclose(file) != 0)
		abort();
	const std::string segments = ie_save_metadata_segments(picture.c_str(), 640, 480, 0);
	/* Whole segments, each within a JPEG segment's length. */
	for (size_t pos = 0; pos < segments.size();) {
		if (segments.size() - pos < 4 || uint8_t(segments[pos]) != 0xFF)
			__builtin_trap();
		pos += 2 + (size_t(uint8_t(segments[pos + 2])) << 8 | uint8_t(segments[pos + 3]));
		if (pos > segments.size())
			__builtin_trap();
	}
	media_content_scan_file(picture.c_str());
	return 0;
}
