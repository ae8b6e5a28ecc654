#include "look.h"
#include "photoeditoreffects.h"

/* Vintage: a print that has aged in a drawer. Faded blacks, creamy
 * highlights, muted colours with a green-yellow cast, darkened corners and a
 * little grain. */
int applyVintage(const unsigned char *in, unsigned char *out, int width, int height)
{
	pee::Look look;
	look.saturation = 190;
	look.red = {40.f, 250.f, 0.92f, 0.35f};
	look.green = {36.f, 236.f, 0.98f, 0.3f};
	look.blue = {58.f, 188.f, 1.05f, 0.2f};
	look.radial = pee::RADIAL_SHADE;
	look.strength = 0.55f;
	look.inner = 0.45f;
	look.outer = 1.25f;
	look.colour = {40, 28, 20};
	look.grain = 9;
	return pee::apply_look(look, in, out, width, height);
}
