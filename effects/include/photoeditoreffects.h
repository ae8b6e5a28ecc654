/* Colour, tone and sharpening effects on BGRA pictures.
 * Every function reads width x height BGRA pixels from `in` and writes the
 * same number to `out` (same size; zero-filled by the caller). They return
 * 0 on success and a non-zero value when the arguments are unusable. */
#ifndef PHOTOEDITOREFFECTS_H
#define PHOTOEDITOREFFECTS_H

#ifdef __cplusplus
extern "C" {
#endif

#define PEE_API __attribute__((visibility("default")))

PEE_API int applyVintage(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int applyOldPhoto(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int applyPopArt(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int applyInvert(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int applySoftglow(const unsigned char *in, unsigned char *out, int width, int height, int level);
PEE_API int applyRetro(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int applyBluewash(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int applySunshine(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int applyNostalgia(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int applyDownlight(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int applyYellowglow(const unsigned char *in, unsigned char *out, int width, int height);
PEE_API int controlGreyscale(const unsigned char *in, unsigned char *out, int width, int height, int level);
PEE_API int controlFadedColour(const unsigned char *in, unsigned char *out, int width, int height, int level);
PEE_API int mi_apply_sharpen_all(const unsigned char *in, unsigned char *out, int width, int height, int level);

#ifdef __cplusplus
}
#endif

#endif
