#include "look.h"
#include "photoeditoreffects.h"

/* Sharpen: an unsharp mask on the luminance, so that edges gain contrast
 * without coloured fringes. `level` 0..10 sets the amount in steps of 25%
 * (4, what the editor passes, adds the full detail once; 0 keeps the
 * picture); other levels are refused. */
int mi_apply_sharpen_all(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	if (!pee::bgra_arguments_usable(in, out, width, height) || level < 0 || level > 10)
		return kit::RESULT_BAD_ARGUMENT;
	return kit::guarded([&] {
		const float amount = float(level) * 0.25f;
		kit::Rgb picture = kit::read_rgb(in, width, height, 4, 2, 1, 0);
		const kit::Plane luma = kit::luma_plane(picture);
		kit::Plane blurred = luma;
		kit::gaussian_blur(blurred, 1.2f);
		kit::Plane *planes[3] = {&picture.r, &picture.g, &picture.b};
		for (size_t i = 0; i < luma.v.size(); ++i) {
			float detail = (luma.v[i] - blurred.v[i]) * amount;
			for (kit::Plane *p : planes)
				p->v[i] += detail;
		}
		kit::write_rgb(picture, out, 4, 2, 1, 0);
		return int(kit::RESULT_OK);
	});
}
