#include "look.h"
#include "photoeditoreffects.h"

/* Sunshine: the same scene on a bright summer afternoon. Lifted mid-tones,
 * a golden warmth and richer colours, with a soft warm light over the
 * middle of the picture. */
int applySunshine(const unsigned char *in, unsigned char *out, int width, int height)
{
	pee::Look look;
	look.saturation = 320;
	look.red = {8.f, 255.f, 0.78f, 0.15f};
	look.green = {4.f, 246.f, 0.85f, 0.15f};
	look.blue = {0.f, 205.f, 1.f, 0.15f};
	look.radial = pee::RADIAL_GLOW;
	look.strength = 0.35f;
	look.inner = 0.f;
	look.outer = 1.1f;
	look.colour = {255, 200, 110};
	return pee::apply_look(look, in, out, width, height);
}
