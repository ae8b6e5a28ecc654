#include "look.h"
#include "photoeditoreffects.h"

namespace {

inline int sharpen_body(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	return kit::guarded([&] {
		const float amount = float(level) * 0.25f;
		kit::Plane luma(width, height);
		const size_t n = luma.v.size();
		for (size_t i = 0; i < n; ++i) {
			const unsigned char *px = in + i * 4;
			luma.v[i] = 0.299f * float(px[2]) + 0.587f * float(px[1]) + 0.114f * float(px[0]);
		}
		kit::Plane blurred(width, height);
		kit::gaussian_blur(luma, blurred, 1.2f);
		for (size_t i = 0; i < n; ++i) {
			const float detail = (luma.v[i] - blurred.v[i]) * amount;
			const unsigned char *px = in + i * 4;
			unsigned char *o = out + i * 4;
			o[0] = kit::clamp_byte(float(px[0]) + detail);
			o[1] = kit::clamp_byte(float(px[1]) + detail);
			o[2] = kit::clamp_byte(float(px[2]) + detail);
			o[3] = 255;
		}
		return int(kit::RESULT_OK);
	});
}

int sharpen_reference(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	return sharpen_body(in, out, width, height, level);
}

#if KIT_X86
__attribute__((target("avx2"), flatten)) int sharpen_avx2(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	return sharpen_body(in, out, width, height, level);
}
#endif

} // namespace

/* Sharpen: an unsharp mask on the luminance, so that edges gain contrast
 * without coloured fringes. `level` 0..10 sets the amount in steps of 25%
 * (4, what the editor passes, adds the full detail once; 0 keeps the
 * picture); other levels are refused. */
int mi_apply_sharpen_all(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	if (!pee::bgra_arguments_usable(in, out, width, height) || level < 0 || level > 10)
		return kit::RESULT_BAD_ARGUMENT;
#if KIT_X86
	if (kit::best_path() == kit::Path::AVX2)
		return sharpen_avx2(in, out, width, height, level);
#endif
	return sharpen_reference(in, out, width, height, level);
}
