#include "look.h"
#include "photoeditoreffects.h"

/* Faded colours: a print left in the sun. `level` 0..100 is how faded:
 * colours lose saturation, blacks lift and whites dim with it; 50 (what the
 * editor passes) leaves soft, washed-out colours, 100 nearly a grey haze,
 * 0 keeps the picture. Other levels are refused. */
int controlFadedColour(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	if (level < 0 || level > 100)
		return kit::RESULT_BAD_ARGUMENT;
	float f = float(level) / 100.f;
	pee::Look look;
	look.saturation = int(256.f * (1.f - 0.8f * f));
	look.red = {110.f * f, 255.f - 40.f * f, 1.f, 0.f};
	look.green = {110.f * f, 255.f - 45.f * f, 1.f, 0.f};
	look.blue = {105.f * f, 255.f - 55.f * f, 1.f, 0.f};
	return pee::apply_look(look, in, out, width, height);
}
