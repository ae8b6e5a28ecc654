/* A picture's way through the loader: the byte walk, the probe, then the
 * decoding into a box a quarter of its size on each side (the reductions
 * the loader asks of it), as the loader calls them. A PNG's CRCs are
 * mended (fuzz-png-crc.h). */
#include <algorithm>
#include <cstdlib>

#include "fuzz-png-crc.h"
#include "ie-image-decode.h"
#include "ie-image-source.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *bytes, size_t size)
{
	const std::vector<uint8_t> file = png_crcs_mended(bytes, size);
	const uint8_t *data = file.data();
	if (!ie_image_facts_get(data, size).complete)
		return 0;
	int w, h;
	if (!ie_image_decode_probe(data, size, &w, &h))
		return 0;
	/* The loader never asks for more than its box holds. */
	const int target_w = std::clamp((w + 3) / 4, 1, 1024), target_h = std::clamp((h + 3) / 4, 1, 1024);
	Ie_Decoded out;
	if (ie_image_decode(data, size, target_w, target_h, nullptr, nullptr, &out) == Ie_Decode_Status::DONE &&
	    (out.w != target_w || out.h != target_h))
		__builtin_trap();
	free(out.pixels);
	return 0;
}
