#include "look.h"
#include "photoeditoreffects.h"

/* Nostalgia: a soft, dreamy memory. Low contrast, pastel rose-tinted
 * colours, milky shadows and a gentle light vignette. */
int applyNostalgia(const unsigned char *in, unsigned char *out, int width, int height)
{
	pee::Look look;
	look.saturation = 150;
	look.red = {66.f, 252.f, 0.88f, 0.f};
	look.green = {50.f, 232.f, 0.95f, 0.f};
	look.blue = {52.f, 214.f, 1.f, 0.f};
	look.radial = pee::RADIAL_SHADE;
	look.strength = 0.45f;
	look.inner = 0.5f;
	look.outer = 1.3f;
	look.colour = {252, 236, 222};
	look.grain = 5;
	return pee::apply_look(look, in, out, width, height);
}
