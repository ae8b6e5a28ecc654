#include "look.h"
#include "photoeditoreffects.h"

/* Downlight: a low-key scene lit from above. Crushed blacks, darker
 * mid-tones and a light pool at the top that falls off into the dark. */
int applyDownlight(const unsigned char *in, unsigned char *out, int width, int height)
{
	pee::Look look;
	look.saturation = 230;
	look.red = {0.f, 252.f, 1.2f, 0.45f};
	look.green = {0.f, 252.f, 1.2f, 0.45f};
	look.blue = {4.f, 255.f, 1.15f, 0.45f};
	look.radial = pee::RADIAL_SHADE;
	look.strength = 0.82f;
	look.inner = 0.35f;
	look.outer = 1.45f;
	look.cy = -1.f;
	look.colour = {0, 2, 8};
	return pee::apply_look(look, in, out, width, height);
}
