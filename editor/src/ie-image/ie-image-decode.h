/* Our own decoding of the pictures most files are, JPEG and PNG, straight to
 * BGRA at a reduced size: a JPEG is scaled down by the decoder itself (its
 * inverse DCT at M/8 of the size) to the smallest size that still covers
 * the target, and the decoder's rows go into the area reducer as they come,
 * so no full-size copy of a large picture is ever held. Progressive JPEG
 * and the common PNG kinds go through decoders of our own
 * (ie-image-progressive, ie-image-png), the rest through libjpeg-turbo and
 * libpng. Everything else (and the JPEG and PNG kinds left out below) goes
 * to Evas. Internal to ie-image. */
#ifndef IE_IMAGE_DECODE_H
#define IE_IMAGE_DECODE_H

#include <cstddef>
#include <cstdint>

enum class Ie_Decode_Status { DONE, FAILED, CANCELLED };

/* The largest picture the editor opens: no side longer than Evas's own
 * loaders take, and no more pixels than IE_DECODE_MAX_PIXELS, past any
 * camera's (16384 x 8192). Beyond it the decoders' working memory (libjpeg
 * holds every coefficient of a progressive file) would run to gigabytes
 * for a file of a few hundred bytes. Every decoder checks it before it
 * allocates anything. */
constexpr int IE_DECODE_MAX_SIDE = 65000;
constexpr int64_t IE_DECODE_MAX_PIXELS = int64_t(1) << 27;

inline bool ie_decode_size_ok(int64_t w, int64_t h)
{
	return w > 0 && h > 0 && w <= IE_DECODE_MAX_SIDE && h <= IE_DECODE_MAX_SIDE && w * h <= IE_DECODE_MAX_PIXELS;
}

struct Ie_Decoded {
	/* target_w x target_h BGRA pixels, premultiplied, from malloc. */
	uint8_t *pixels;
	int w, h;
	bool alpha;
};

/* Polled between strips of rows; true stops the decoding. */
typedef bool (*Ie_Decode_Stop)(void *data);

/* Whether we decode this file ourselves, and its size as stored: an 8-bit
 * JPEG in greys, YCbCr or RGB (not CMYK), or a PNG that is not interlaced
 * (the passes would need the whole picture held), within the size above. */
bool ie_image_decode_probe(const uint8_t *data, size_t size, int *w, int *h);

/* Decodes a file ie_image_decode_probe accepted into target_w x target_h,
 * no larger than the stored size on either side. Damaged data gives
 * FAILED; `stop` (may be NULL) gives CANCELLED. */
Ie_Decode_Status ie_image_decode(const uint8_t *data, size_t size, int target_w, int target_h, Ie_Decode_Stop stop,
				 void *stop_data, Ie_Decoded *out);

#endif
