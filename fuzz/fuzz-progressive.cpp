/* Our own progressive JPEG decoding: the scans read and the pixels
 * rendered. The input's length picks the scale (a small or a full-size
 * target) and the bit operations, so that every seed reaches each. */
#include "ie-image-progressive.h"

namespace {

void take_rows(void *, const uint8_t *, int) {}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
	const int target = (size & 1) ? 1 : 1 << 16;
	const bool portable = size & 2;
	Ie_Progressive picture;
	if (ie_progressive_read(data, size, target, target, nullptr, nullptr, &picture, portable) ==
	    Ie_Progressive_Status::DONE)
		ie_progressive_render(picture, take_rows, nullptr, nullptr, nullptr);
	ie_progressive_free(&picture);
	return 0;
}
