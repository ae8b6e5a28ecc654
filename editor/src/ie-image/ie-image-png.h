/* Our own decoding of the PNGs photos are saved as: 8 bits a sample, greys
 * or RGB, with or without alpha, not interlaced, no palette nor
 * transparent colour. Every chunk's CRC is checked; the image data is
 * inflated by ISA-L as a stream, a few rows at a time, each row unfiltered
 * and given as BGRA exactly as libpng gives it (premultiplied where there
 * is alpha). Any other kind, and anything amiss, is refused with NOT_OURS
 * (possibly after some rows were given), and the caller hands the file to
 * libpng, which decides. Internal to ie-image. */
#ifndef IE_IMAGE_PNG_H
#define IE_IMAGE_PNG_H

#include <cstddef>
#include <cstdint>

#include "ie-image-decode.h"

enum class Ie_Png_Status { DONE, NOT_OURS, CANCELLED };

/* BGRA rows, top down, in strips; `alpha` tells whether the picture has
 * any. */
typedef void (*Ie_Png_Rows)(void *data, const uint8_t *rows, int count);

/* The picture's size and alpha, or false when it is not ours. */
bool ie_png_probe(const uint8_t *data, size_t size, int *w, int *h, bool *alpha);

Ie_Png_Status ie_png_decode(const uint8_t *data, size_t size, Ie_Png_Rows rows, void *rows_data, Ie_Decode_Stop stop,
			    void *stop_data);

/* Undoes one row's PNG filter in place: `row` and `prior` (the row above,
 * unfiltered; NULL for the first) hold `length` bytes of `bpp`-byte
 * pixels. False for an unknown filter type. The reference, and the path
 * the decoder takes. */
bool ie_png_unfilter_reference(int type, uint8_t *row, const uint8_t *prior, size_t length, int bpp);
bool ie_png_unfilter(int type, uint8_t *row, const uint8_t *prior, size_t length, int bpp);

#endif
