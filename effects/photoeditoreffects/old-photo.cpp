#include "look.h"
#include "photoeditoreffects.h"

/* Old photo: a worn sepia-brown print a century old. Monochrome in brown
 * tones, low contrast, heavy dark corners, coarse grain, dust flecks and a
 * few vertical scratches. */
int applyOldPhoto(const unsigned char *in, unsigned char *out, int width, int height)
{
	pee::Look look;
	look.saturation = 0;
	look.red = {48.f, 236.f, 0.9f, 0.25f};
	look.green = {34.f, 214.f, 0.95f, 0.25f};
	look.blue = {22.f, 170.f, 1.05f, 0.25f};
	look.radial = pee::RADIAL_SHADE;
	look.strength = 0.85f;
	look.inner = 0.35f;
	look.outer = 1.2f;
	look.colour = {38, 24, 12};
	look.grain = 16;
	look.worn = true;
	return pee::apply_look(look, in, out, width, height);
}
