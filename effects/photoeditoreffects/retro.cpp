#include "look.h"
#include "photoeditoreffects.h"

/* Retro: cross-processed film of the seventies. Punchy contrast, yellow
 * highlights, blue-teal shadows and saturated colours, with dark corners. */
int applyRetro(const unsigned char *in, unsigned char *out, int width, int height)
{
	pee::Look look;
	look.saturation = 300;
	look.red = {0.f, 255.f, 1.1f, 0.7f};
	look.green = {10.f, 250.f, 0.95f, 0.5f};
	look.blue = {60.f, 190.f, 1.f, 0.1f};
	look.radial = pee::RADIAL_SHADE;
	look.strength = 0.65f;
	look.inner = 0.4f;
	look.outer = 1.15f;
	look.colour = {10, 20, 30};
	look.grain = 7;
	return pee::apply_look(look, in, out, width, height);
}
