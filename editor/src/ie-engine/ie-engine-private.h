/* Inside the engine: the engine's log line, shared size rules, and the
 * individual paths of each routine (the plain reference and the faster ones),
 * exposed so that the tests can hold every path against the reference. */
#ifndef IE_ENGINE_PRIVATE_H
#define IE_ENGINE_PRIVATE_H

#include <stddef.h>
#include <stdint.h>

#include <platform_log.h>

#include "ie-engine.h"

#define IEL_LOG_TAG "MARLUNE"

#define IEL_LOG_E(fmt, ...) \
	__dlog_print(PLATFORM_LOG_ERROR, IEL_LOG_TAG, "%s: %s(%d) > \033[31m" fmt "\033[0m", \
		     __FILE_NAME__, __func__, __LINE__, ##__VA_ARGS__)

#ifdef __cplusplus
extern "C" {
#endif

/* Bytes per pixel of the routines that step by format: RGB565 2, BGRA 4,
 * every other code 3 (format 4 included, as the record types define it). */
static inline int iel_bytes_per_pixel(int format)
{
	return format == IEL_FORMAT_RGB565 ? 2 : format == IEL_FORMAT_BGRA8888 ? 4 : 3;
}

static inline int iel_format_known(int format)
{
	return format >= IEL_FORMAT_RGB565 && format <= IEL_FORMAT_ARGB8888;
}

/* width x height x bytes_per_pixel as a byte count, or 0 when it cannot be
 * addressed (past PTRDIFF_MAX), so that a huge record is refused instead of
 * wrapping into a small count. *ok tells a real 0 from a refusal. */
size_t iel_byte_count(uint32_t width, uint32_t height, unsigned bytes_per_pixel, int *ok);

/* Whether the AVX2 (and AVX-512F) paths may run; IEL_NO_SIMD=1 in the
 * environment turns them all off and IEL_NO_AVX512=1 the AVX-512 ones, so
 * that every path can be exercised on this machine. */
int iel_cpu_has_avx2(void);
int iel_cpu_has_avx512(void);

/* How many threads a routine may split its work over, where the result is
 * the same whatever the count: the processor's cores, IEL_THREADS=N in the
 * environment, or what iel_thread_count_set gave (0 restores the default). */
int iel_thread_count(void);
void iel_thread_count_set(int count);

/* Rotation: pixel loops without checks. */
void iel_rotate_reference(const uint8_t *src, uint8_t *dst, uint32_t width, uint32_t height,
			  int bytes_per_pixel, unsigned int rotation);
void iel_rotate32_tiled(const uint32_t *src, uint32_t *dst, uint32_t width, uint32_t height,
			unsigned int rotation);
void iel_rotate32_avx2(const uint32_t *src, uint32_t *dst, uint32_t width, uint32_t height,
		       unsigned int rotation);

/* Orientation (EXIF values 1 to 8, checked by the caller). */
void iel_orient_reference(const uint8_t *src, uint8_t *dst, uint32_t width, uint32_t height,
			  int bytes_per_pixel, unsigned int orientation);
void iel_orient32_tiled(const uint32_t *src, uint32_t *dst, uint32_t width, uint32_t height,
			unsigned int orientation);

/* Resize of BGRA pictures (src at least 1 x 1). */
void iel_resize_reference(const uint8_t *src, uint32_t src_width, uint32_t src_height,
			  uint8_t *dst, uint32_t dst_width, uint32_t dst_height);
/* Need a source at least 2 x 2. */
void iel_resize_avx2(const uint8_t *src, uint32_t src_width, uint32_t src_height,
		     uint8_t *dst, uint32_t dst_width, uint32_t dst_height);
void iel_resize_avx512(const uint8_t *src, uint32_t src_width, uint32_t src_height,
		       uint8_t *dst, uint32_t dst_width, uint32_t dst_height);

/* Area reduction: the reducer on the reference kernels (simd 0) or the
 * AVX2 ones, and those kernels. Gather: sums[i] (+)= weight x row[i] over
 * `count` bytes, set when `start`. Emit: one output row from its sums. */
IEL_Reducer *iel_reducer_new(uint32_t src_w, uint32_t src_h, uint32_t dst_w, uint32_t dst_h, uint8_t *dst,
			     int simd);
void iel_reducer_push(IEL_Reducer *reducer, const uint8_t *rows, uint32_t count);
void iel_reducer_free(IEL_Reducer *reducer);
void iel_reduce_gather_reference(uint32_t *sums, const uint8_t *row, size_t count, uint32_t weight, int start);
void iel_reduce_gather_avx2(uint32_t *sums, const uint8_t *row, size_t count, uint32_t weight, int start);
void iel_reduce_emit_reference(const IEL_Reducer *reducer, const uint32_t *sums, uint16_t *narrowed, uint8_t *out);
void iel_reduce_emit_avx2(const IEL_Reducer *reducer, const uint32_t *sums, uint16_t *narrowed, uint8_t *out);

/* Blend of `count` bytes, alpha bytes (every fourth from index 3) kept. */
void iel_blend_reference(const uint8_t *effect, uint8_t *inout, size_t count, uint8_t a);
void iel_blend_avx2(const uint8_t *effect, uint8_t *inout, size_t count, uint8_t a);

/* Box blur of BGRA pixels with the caller's sum planes (n x L x 4 int32,
 * L = width + 3 x radius x column_step). Radius 1 to 5, steps 1 to 10. */
void iel_blur_reference(const uint8_t *src, uint8_t *dst, uint32_t width, uint32_t height,
			int32_t *planes, unsigned int radius, unsigned int column_step,
			unsigned int row_step);
void iel_blur_avx2(const uint8_t *src, uint8_t *dst, uint32_t width, uint32_t height,
		   int32_t *planes, unsigned int radius, unsigned int column_step,
		   unsigned int row_step);
/* Radius of a blur level: 1 to 5 for levels 0 to 4 and above. */
unsigned int iel_blur_radius(unsigned int level);

/* Sepia of `pixels` pixels of `bytes_per_pixel` bytes. */
void iel_sepia_reference(const uint8_t *src, uint8_t *dst, size_t pixels, int bytes_per_pixel);
void iel_sepia_fast(const uint8_t *src, uint8_t *dst, size_t pixels, int bytes_per_pixel);
void iel_sepia_avx2(const uint8_t *src, uint8_t *dst, size_t pixels);

/* Posterise table of a strength 0 to 6, and its mapping over bytes. */
void iel_posterize_table(int strength, uint8_t table[256]);
void iel_posterize_reference(const uint8_t *src, uint8_t *dst, size_t count, const uint8_t table[256]);
void iel_posterize_avx2(const uint8_t *src, uint8_t *dst, size_t count, int strength);

/* Where IEL_Sketch reads its texture; tests point it elsewhere. NULL restores
 * RES_DIR "images/sketch.raw". */
void iel_sketch_texture_path_set(const char *path);

/* The closed-engine wrappers' conversions: BGRA to the engine's RGB888, and
 * its RGB888 back to BGRA with alpha 255. */
void iel_bgra_to_rgb_reference(const uint8_t *bgra, uint8_t *rgb, size_t count);
void iel_bgra_to_rgb_avx2(const uint8_t *bgra, uint8_t *rgb, size_t count);
void iel_rgb_to_opaque_bgra_reference(const uint8_t *rgb, uint8_t *bgra, size_t count);
void iel_rgb_to_opaque_bgra_avx2(const uint8_t *rgb, uint8_t *bgra, size_t count);

#ifdef __cplusplus
}
#endif

#endif
