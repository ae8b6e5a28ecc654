#include "look.h"
#include "photoeditoreffects.h"

/* Negative: every colour channel inverted; applied twice it gives the
 * picture back. */
int applyInvert(const unsigned char *in, unsigned char *out, int width, int height)
{
	if (!pee::bgra_arguments_usable(in, out, width, height))
		return kit::RESULT_BAD_ARGUMENT;
	/* Whole pixels as words: flip the colour bytes, set the alpha byte. */
	constexpr uint32_t ALPHA = __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__ ? 0xff000000u : 0x000000ffu;
	size_t n = size_t(width) * size_t(height);
	for (size_t i = 0; i < n; ++i) {
		uint32_t pixel;
		std::memcpy(&pixel, in + i * 4, 4);
		pixel = ~pixel | ALPHA;
		std::memcpy(out + i * 4, &pixel, 4);
	}
	return kit::RESULT_OK;
}
