/* The byte walk the loader does before decoding: damage and the EXIF
 * orientation. */
#include "ie-image-source.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
	const Ie_Image_Facts facts = ie_image_facts_get(data, size);
	if (facts.orientation < 1 || facts.orientation > 8)
		__builtin_trap();
	return 0;
}
