#include "look.h"
#include "photoeditoreffects.h"

/* Bluewash: a cold, blue-toned print like a cyanotype. Nearly
 * monochrome, shadows in deep Prussian blue and highlights in pale cyan. */
int applyBluewash(const unsigned char *in, unsigned char *out, int width, int height)
{
	pee::Look look;
	look.saturation = 40;
	look.red = {10.f, 205.f, 1.2f, 0.2f};
	look.green = {32.f, 232.f, 1.05f, 0.2f};
	look.blue = {72.f, 255.f, 0.85f, 0.2f};
	look.radial = pee::RADIAL_SHADE;
	look.strength = 0.4f;
	look.inner = 0.4f;
	look.outer = 1.2f;
	look.colour = {5, 20, 60};
	return pee::apply_look(look, in, out, width, height);
}
