/* Our own decoding of progressive JPEG, the kind phones and editors write
 * for the web and the one libjpeg is slowest on: every scan is
 * entropy-decoded into coefficient planes (exactly the coefficients
 * libjpeg's own decoding gives), then each block is turned into pixels
 * at S/8 of the size (S 1, 2, 4 or 8) by an inverse DCT of its lowest
 * S x S coefficients, chroma at its own scale so that it needs no
 * upsampling, and converted to BGRA. Anything unusual (a sampling, a
 * colour space or a scan this decoder does not take, and any damage) is
 * refused with NOT_OURS, and the caller hands the file to libjpeg, which
 * decides. Internal to ie-image. */
#ifndef IE_IMAGE_PROGRESSIVE_H
#define IE_IMAGE_PROGRESSIVE_H

#include <cstddef>
#include <cstdint>

#include "ie-image-decode.h"

struct Ie_Progressive_Plane {
	int id;
	int h, v;		    /* sampling factors */
	int blocks_w, blocks_h;	    /* held: whole MCUs */
	int used_w, used_h;	    /* the component's own blocks */
	/* The first `kept` coefficients of each block in zigzag order, as
	 * coded: those the inverse DCT at the chosen scale reads. */
	int kept;
	int16_t *coefficients;
	uint16_t quant[64];	    /* zigzag order */
};

/* Natural (row by row) index of the k-th coefficient in zigzag order. */
inline constexpr uint8_t IE_JPEG_NATURAL_ORDER[64] = { 0,  1,  8,  16, 9,  2,  3,  10, 17, 24, 32, 25, 18, 11, 4,  5,
						       12, 19, 26, 33, 40, 48, 41, 34, 27, 20, 13, 6,  7,  14, 21, 28,
						       35, 42, 49, 56, 57, 50, 43, 36, 29, 22, 15, 23, 30, 37, 44, 51,
						       58, 59, 52, 45, 38, 31, 39, 46, 53, 60, 61, 54, 47, 55, 62, 63 };

inline size_t ie_progressive_block_index(const Ie_Progressive_Plane &plane, int bx, int by)
{
	return size_t(by) * size_t(plane.blocks_w) + size_t(bx);
}

/* A block's kept coefficients. */
inline const int16_t *ie_progressive_block(const Ie_Progressive_Plane &plane, int bx, int by)
{
	return plane.coefficients + ie_progressive_block_index(plane, bx, by) * size_t(plane.kept);
}

struct Ie_Progressive {
	int width, height, components;
	int hmax, vmax, mcus_x, mcus_y;
	/* S of S/8: the smallest of 1, 2, 4, 8 that covers the target. */
	int scale;
	Ie_Progressive_Plane planes[3];
};

enum class Ie_Progressive_Status { DONE, NOT_OURS, CANCELLED };

/* A progressive JPEG of 1 (greys) or 3 (YCbCr) components of 8 bits (the
 * caller has checked the colour space), to be shown at target_w x
 * target_h or less. `out` is released by ie_progressive_free whatever the
 * status. `portable` keeps to plain C++ bit operations, where otherwise
 * the processor's own are used: the results are the same. */
Ie_Progressive_Status ie_progressive_read(const uint8_t *data, size_t size, int target_w, int target_h,
					  Ie_Decode_Stop stop, void *stop_data, Ie_Progressive *out,
					  bool portable = false);
void ie_progressive_free(Ie_Progressive *p);

/* The size at the chosen scale, rounded up, and whether every component
 * reaches it without upsampling (ie-image-progressive-pixels.cpp, as the
 * rendering below). */
bool ie_progressive_scale_ok(const Ie_Progressive &p, int *w, int *h);

/* Gives the picture at the chosen scale as BGRA rows, top down, in
 * strips. */
typedef void (*Ie_Progressive_Rows)(void *data, const uint8_t *rows, int count);
Ie_Decode_Status ie_progressive_render(const Ie_Progressive &p, Ie_Progressive_Rows rows, void *data,
				       Ie_Decode_Stop stop, void *stop_data);

#endif
