#include "look.h"
#include "photoeditoreffects.h"

/* Yellow glow: seen through amber glass. A strong yellow cast in the
 * highlights and a bright yellow bloom over the centre. */
int applyYellowglow(const unsigned char *in, unsigned char *out, int width, int height)
{
	pee::Look look;
	look.saturation = 230;
	look.red = {16.f, 255.f, 0.9f, 0.2f};
	look.green = {12.f, 250.f, 0.9f, 0.2f};
	look.blue = {0.f, 195.f, 1.1f, 0.2f};
	look.radial = pee::RADIAL_GLOW;
	look.strength = 0.55f;
	look.inner = 0.05f;
	look.outer = 1.1f;
	look.colour = {255, 215, 80};
	return pee::apply_look(look, in, out, width, height);
}
