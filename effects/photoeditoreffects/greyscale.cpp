#include "look.h"
#include "photoeditoreffects.h"

/* Greyscale. `level` 0..10 is how far the colours go towards grey: 0 keeps
 * the picture, 10 (what the editor passes) gives pure BT.601 luma with all
 * three channels equal. Other levels are refused. */
int controlGreyscale(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	if (level < 0 || level > 10)
		return kit::RESULT_BAD_ARGUMENT;
	pee::Look look;
	look.saturation = 256 * (10 - level) / 10;
	return pee::apply_look(look, in, out, width, height);
}
