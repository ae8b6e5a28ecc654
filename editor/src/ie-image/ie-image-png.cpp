/* PNG decoding; see ie-image-png.h. The checks are libpng's for these
 * kinds: a bad CRC, a short or over-long chunk, a missing or damaged
 * zlib stream (its Adler-32 included) or too little image data refuse the
 * file here, and libpng then reports it as it always has. */
#include "ie-image-png.h"

#include <isa-l/crc.h>
#include <isa-l/igzip_lib.h>

#include <immintrin.h>

#include <algorithm>
#include <condition_variable>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <mutex>
#include <new>
#include <system_error>
#include <thread>
#include <vector>

#include "ie-engine-private.h"

namespace {

constexpr uint8_t SIGNATURE[] = { 0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n' };
constexpr size_t CHUNK_FRAME = 12; /* length, type, CRC */
constexpr uint32_t LONGEST_CHUNK = 0x7FFFFFFF;
/* Rows inflated, unfiltered and handed on at a time. */
constexpr int STRIP_ROWS = 16;

enum Colour { GREY = 0, RGB = 2, GREY_ALPHA = 4, RGBA = 6 };
enum Filter { NONE, SUB, UP, AVERAGE, PAETH };

uint32_t be32(const uint8_t *p)
{
	return uint32_t(p[0]) << 24 | uint32_t(p[1]) << 16 | uint32_t(p[2]) << 8 | p[3];
}

struct Chunk {
	uint32_t length;
	const uint8_t *type, *body;
};

/* The chunks in order, each whole and its CRC right; false at the first
 * that is not. */
class Chunk_Walk {
public:
	Chunk_Walk(const uint8_t *data, size_t size) : data_(data), size_(size), pos_(sizeof(SIGNATURE)) {}

	bool next(Chunk *chunk)
	{
		if (size_ - pos_ < CHUNK_FRAME)
			return false;
		const uint8_t *p = data_ + pos_;
		const uint32_t length = be32(p);
		if (length > LONGEST_CHUNK || size_ - pos_ - CHUNK_FRAME < length)
			return false;
		if (crc32_gzip_refl(0, p + 4, length + 4) != be32(p + 8 + length))
			return false;
		*chunk = { length, p + 4, p + 8 };
		pos_ += CHUNK_FRAME + length;
		return true;
	}

private:
	const uint8_t *data_;
	size_t size_, pos_;
};

bool is(const Chunk &chunk, const char *type)
{
	return memcmp(chunk.type, type, 4) == 0;
}

struct Header {
	uint32_t w, h;
	int colour, bpp;
};

bool read_header(const uint8_t *data, size_t size, Header *header)
{
	if (size < sizeof(SIGNATURE) || memcmp(data, SIGNATURE, sizeof(SIGNATURE)) != 0)
		return false;
	Chunk_Walk walk(data, size);
	Chunk ihdr;
	if (!walk.next(&ihdr) || !is(ihdr, "IHDR") || ihdr.length != 13)
		return false;
	const uint8_t *b = ihdr.body;
	header->w = be32(b);
	header->h = be32(b + 4);
	header->colour = b[9];
	const int depth = b[8], compression = b[10], filter = b[11], interlace = b[12];
	header->bpp = header->colour == GREY ? 1 : header->colour == GREY_ALPHA ? 2 : header->colour == RGB ? 3 : 4;
	const bool colour_ok = header->colour == GREY || header->colour == RGB || header->colour == GREY_ALPHA ||
			       header->colour == RGBA;
	return colour_ok && depth == 8 && compression == 0 && filter == 0 && interlace == 0 &&
	       ie_decode_size_ok(header->w, header->h);
}

inline int paeth(int a, int b, int c)
{
	const int p = a + b - c;
	const int pa = abs(p - a), pb = abs(p - b), pc = abs(p - c);
	return pa <= pb && pa <= pc ? a : pb <= pc ? b : c;
}

/* Rows of 3 or 4 bytes a pixel with the pixel's bytes together in 16-bit
 * lanes: the sequential filters then take a pixel a step instead of a
 * byte. */
template <int Bpp> __attribute__((target("avx2"))) inline __m128i load_pixel(const uint8_t *p)
{
	/* Assembled in a register: a 3-byte copy through memory would stall
	 * the load behind the stores. */
	uint32_t v = uint32_t(p[0]) | uint32_t(p[1]) << 8 | uint32_t(p[2]) << 16;
	if constexpr (Bpp == 4)
		v |= uint32_t(p[3]) << 24;
	return _mm_cvtepu8_epi16(_mm_cvtsi32_si128(int(v)));
}

template <int Bpp> __attribute__((target("avx2"))) inline void store_pixel(uint8_t *p, __m128i v)
{
	const uint32_t packed = uint32_t(_mm_cvtsi128_si32(_mm_packus_epi16(v, v)));
	p[0] = uint8_t(packed);
	p[1] = uint8_t(packed >> 8);
	p[2] = uint8_t(packed >> 16);
	if constexpr (Bpp == 4)
		p[3] = uint8_t(packed >> 24);
}

template <int Bpp, int Type>
__attribute__((target("avx2"))) void unfilter_pixels_avx2(uint8_t *row, const uint8_t *prior, size_t length)
{
	const __m128i bytes = _mm_set1_epi16(0xFF), one = _mm_set1_epi16(1);
	__m128i a = _mm_setzero_si128(), c = _mm_setzero_si128();
	for (size_t i = 0; i < length; i += Bpp) {
		const __m128i x = load_pixel<Bpp>(row + i), b = load_pixel<Bpp>(prior + i);
		__m128i out;
		if constexpr (Type == AVERAGE) {
			out = _mm_and_si128(_mm_add_epi16(x, _mm_srli_epi16(_mm_add_epi16(a, b), 1)), bytes);
		} else {
			/* Paeth, as its definition reads, lane by lane. */
			const __m128i pa = _mm_abs_epi16(_mm_sub_epi16(b, c));
			const __m128i pb = _mm_abs_epi16(_mm_sub_epi16(a, c));
			const __m128i pc = _mm_abs_epi16(_mm_sub_epi16(_mm_add_epi16(a, b), _mm_add_epi16(c, c)));
			const __m128i take_a = _mm_and_si128(_mm_cmpgt_epi16(_mm_add_epi16(pb, one), pa),
							     _mm_cmpgt_epi16(_mm_add_epi16(pc, one), pa));
			const __m128i take_b = _mm_cmpgt_epi16(_mm_add_epi16(pc, one), pb);
			const __m128i predictor = _mm_blendv_epi8(_mm_blendv_epi8(c, b, take_b), a, take_a);
			out = _mm_and_si128(_mm_add_epi16(x, predictor), bytes);
		}
		store_pixel<Bpp>(row + i, out);
		a = out;
		c = b;
	}
}

void unfilter_pixels(int type, uint8_t *row, const uint8_t *prior, size_t length, int bpp)
{
	if (bpp == 3)
		(type == AVERAGE ? unfilter_pixels_avx2<3, AVERAGE> : unfilter_pixels_avx2<3, PAETH>)(row, prior, length);
	else
		(type == AVERAGE ? unfilter_pixels_avx2<4, AVERAGE> : unfilter_pixels_avx2<4, PAETH>)(row, prior, length);
}

} // namespace

bool ie_png_unfilter_reference(int type, uint8_t *row, const uint8_t *prior, size_t length, int bpp)
{
	const size_t step = size_t(bpp);
	for (size_t i = 0; i < length; i++) {
		const int a = i >= step ? row[i - step] : 0;
		const int b = prior ? prior[i] : 0;
		const int c = prior && i >= step ? prior[i - step] : 0;
		int predictor;
		switch (type) {
		case NONE:
			predictor = 0;
			break;
		case SUB:
			predictor = a;
			break;
		case UP:
			predictor = b;
			break;
		case AVERAGE:
			predictor = (a + b) >> 1;
			break;
		case PAETH:
			predictor = paeth(a, b, c);
			break;
		default:
			return false;
		}
		row[i] = uint8_t(row[i] + predictor);
	}
	return true;
}

bool ie_png_unfilter(int type, uint8_t *row, const uint8_t *prior, size_t length, int bpp)
{
	switch (type) {
	case NONE:
		return true;
	case UP:
		if (prior)
			for (size_t i = 0; i < length; i++)
				row[i] = uint8_t(row[i] + prior[i]);
		return true;
	case SUB:
		for (size_t i = size_t(bpp); i < length; i++)
			row[i] = uint8_t(row[i] + row[i - size_t(bpp)]);
		return true;
	case AVERAGE:
	case PAETH:
		/* The first row's prior is zeros: Paeth is then Sub and Average
		 * half of the left pixel, as the reference has it. */
		if ((bpp == 3 || bpp == 4) && prior && iel_cpu_has_avx2() && length % size_t(bpp) == 0) {
			unfilter_pixels(type, row, prior, length, bpp);
			return true;
		}
		return ie_png_unfilter_reference(type, row, prior, length, bpp);
	default:
		return false;
	}
}

bool ie_png_probe(const uint8_t *data, size_t size, int *w, int *h, bool *alpha)
{
	Header header;
	if (!read_header(data, size, &header))
		return false;
	/* A palette or a transparent colour is libpng's to expand. */
	Chunk_Walk walk(data, size);
	Chunk chunk;
	while (walk.next(&chunk) && !is(chunk, "IDAT")) {
		if (is(chunk, "PLTE") || is(chunk, "tRNS"))
			return false;
	}
	*w = int(header.w);
	*h = int(header.h);
	*alpha = header.colour & 4;
	return true;
}

namespace {

/* Strips in flight between the two threads of a pipelined decoding. */
constexpr int RING_STRIPS = 4;

/* The inflating side: the IDAT chunks in, filtered rows out. */
class Inflater {
public:
	Inflater(const uint8_t *data, size_t size) : walk_(data, size)
	{
		/* From the chunk after IHDR, which read_header checked. */
		Chunk ihdr;
		walk_.next(&ihdr);
		isal_inflate_init(&zlib_);
		zlib_.crc_flag = ISAL_ZLIB;
	}

	/* Fills `size` bytes, or fails: damaged data, or too little of it.
	 * The inflater may hold output back after it has taken all its input,
	 * so a call with no input left is made before giving up. */
	bool fill(uint8_t *to, size_t size)
	{
		zlib_.next_out = to;
		zlib_.avail_out = uint32_t(size);
		while (zlib_.avail_out > 0) {
			if (zlib_.avail_in == 0 && input_left_)
				input_left_ = feed();
			const uint32_t before = zlib_.avail_out;
			if (isal_inflate(&zlib_) != ISAL_DECOMP_OK)
				return false;
			if (zlib_.block_state == ISAL_BLOCK_FINISH)
				return zlib_.avail_out == 0;
			if (zlib_.avail_out == before && zlib_.avail_in == 0 && !input_left_)
				return false;
		}
		return true;
	}

	/* The stream must end whole, with its checksum, and the file with
	 * IEND. A little image data beyond the rows is passed over; much more
	 * is left to libpng rather than inflated here. */
	bool finish()
	{
		for (int spilled = 0; zlib_.block_state != ISAL_BLOCK_FINISH; spilled++) {
			uint8_t spill[256];
			if (spilled == 16 || (!fill(spill, sizeof(spill)) && zlib_.block_state != ISAL_BLOCK_FINISH))
				return false;
		}
		Chunk chunk;
		while (!ended_ && walk_.next(&chunk)) {
			if (is(chunk, "IEND"))
				ended_ = true;
			else if (is(chunk, "PLTE") || is(chunk, "tRNS") || is(chunk, "IHDR"))
				return false;
		}
		return ended_;
	}

private:
	/* The next IDAT, which must follow the last. */
	bool feed()
	{
		Chunk chunk;
		while (walk_.next(&chunk)) {
			if (is(chunk, "IDAT")) {
				if (data_done_)
					return false;
				in_data_ = true;
				zlib_.next_in = const_cast<uint8_t *>(chunk.body);
				zlib_.avail_in = chunk.length;
				if (chunk.length)
					return true;
				continue;
			}
			if (is(chunk, "PLTE") || is(chunk, "tRNS") || is(chunk, "IHDR"))
				return false;
			if (is(chunk, "IEND")) {
				ended_ = true;
				return false;
			}
			if (in_data_)
				data_done_ = true;
		}
		return false;
	}

	Chunk_Walk walk_;
	inflate_state zlib_;
	bool in_data_ = false, data_done_ = false, ended_ = false, input_left_ = true;
};

/* RGB to BGRA four pixels a step; reads 4 bytes past the last pixel. */
__attribute__((target("avx2"))) uint32_t rgb_to_bgra_avx2(const uint8_t *from, uint8_t *to, uint32_t w)
{
	const __m128i order = _mm_setr_epi8(2, 1, 0, -1, 5, 4, 3, -1, 8, 7, 6, -1, 11, 10, 9, -1);
	const __m128i opaque = _mm_set1_epi32(int(0xFF000000u));
	uint32_t x = 0;
	for (; x + 4 <= w; x += 4) {
		const __m128i rgb = _mm_loadu_si128(reinterpret_cast<const __m128i *>(from + 3 * x));
		_mm_storeu_si128(reinterpret_cast<__m128i *>(to + 4 * x), _mm_or_si128(_mm_shuffle_epi8(rgb, order), opaque));
	}
	return x;
}

/* As libpng gives them with the loader's transforms: grey to all three,
 * alpha 0xFF where there is none, colours scaled by (alpha + 1) / 256. */
void to_bgra(const uint8_t *from, uint8_t *to, uint32_t w, int colour)
{
	uint32_t x = 0;
	switch (colour) {
	case GREY:
		for (; x < w; x++) {
			to[4 * x] = to[4 * x + 1] = to[4 * x + 2] = from[x];
			to[4 * x + 3] = 0xFF;
		}
		break;
	case GREY_ALPHA:
		for (; x < w; x++) {
			const unsigned a = from[2 * x + 1] + 1u;
			to[4 * x] = to[4 * x + 1] = to[4 * x + 2] = uint8_t((from[2 * x] * a) >> 8);
			to[4 * x + 3] = from[2 * x + 1];
		}
		break;
	case RGB:
		if (iel_cpu_has_avx2())
			x = rgb_to_bgra_avx2(from, to, w);
		for (; x < w; x++) {
			to[4 * x] = from[3 * x + 2];
			to[4 * x + 1] = from[3 * x + 1];
			to[4 * x + 2] = from[3 * x];
			to[4 * x + 3] = 0xFF;
		}
		break;
	default:
		for (; x < w; x++) {
			const uint8_t *p = from + 4 * x;
			const unsigned a = p[3] + 1u;
			to[4 * x] = uint8_t((p[2] * a) >> 8);
			to[4 * x + 1] = uint8_t((p[1] * a) >> 8);
			to[4 * x + 2] = uint8_t((p[0] * a) >> 8);
			to[4 * x + 3] = p[3];
		}
		break;
	}
}

/* The other side: filtered rows in, BGRA rows out, in order. */
class Unfilterer {
public:
	Unfilterer(const Header &header, Ie_Png_Rows rows, void *rows_data)
		: header_(header), row_bytes_(size_t(header.w) * size_t(header.bpp)), rows_(rows), rows_data_(rows_data),
		  prior_(row_bytes_), strip_(size_t(header.w) * 4 * STRIP_ROWS)
	{
	}

	size_t stride() const { return row_bytes_ + 1; }

	/* `count` rows, each after its filter byte. */
	bool take(uint8_t *filtered, int count)
	{
		for (int i = 0; i < count; i++, y_++) {
			uint8_t *row = filtered + stride() * size_t(i);
			const uint8_t *prior = i > 0 ? row - stride() + 1 : y_ > 0 ? prior_.data() : nullptr;
			if (!ie_png_unfilter(row[0], row + 1, prior, row_bytes_, header_.bpp))
				return false;
			to_bgra(row + 1, &strip_[size_t(header_.w) * 4 * size_t(i)], header_.w, header_.colour);
		}
		memcpy(prior_.data(), filtered + stride() * size_t(count - 1) + 1, row_bytes_);
		rows_(rows_data_, strip_.data(), count);
		return true;
	}

private:
	const Header header_;
	const size_t row_bytes_;
	const Ie_Png_Rows rows_;
	void *const rows_data_;
	uint32_t y_ = 0;
	std::vector<uint8_t> prior_; /* the last row taken, unfiltered */
	std::vector<uint8_t> strip_; /* BGRA */
};

/* The strips of one decoding, handed from the inflating thread to the
 * unfiltering one. */
struct Strip_Ring {
	std::mutex lock;
	std::condition_variable changed;
	int produced = 0, consumed = 0;
	bool failed = false, abandoned = false;
};

} // namespace

Ie_Png_Status ie_png_decode(const uint8_t *data, size_t size, Ie_Png_Rows rows, void *rows_data, Ie_Decode_Stop stop,
			    void *stop_data)
{
	Header header;
	if (!read_header(data, size, &header))
		return Ie_Png_Status::NOT_OURS;
	const int strips = int((header.h + STRIP_ROWS - 1) / STRIP_ROWS);
	auto strip_rows = [&](int i) { return int(std::min<uint32_t>(STRIP_ROWS, header.h - uint32_t(i) * STRIP_ROWS)); };
	std::unique_ptr<Inflater> inflater;
	std::unique_ptr<Unfilterer> unfilterer;
	std::vector<std::vector<uint8_t>> buffers;
	const bool pipelined = iel_thread_count() > 1 && strips > 1;
	try {
		inflater.reset(new Inflater(data, size));
		unfilterer.reset(new Unfilterer(header, rows, rows_data));
		/* Room for the colour conversion's reads past the last row. */
		buffers.assign(pipelined ? RING_STRIPS : 1, std::vector<uint8_t>(unfilterer->stride() * STRIP_ROWS + 16));
	} catch (const std::bad_alloc &) {
		return Ie_Png_Status::NOT_OURS;
	}
	const size_t stride = unfilterer->stride();

	if (!pipelined) {
		for (int i = 0; i < strips; i++) {
			if (stop && stop(stop_data))
				return Ie_Png_Status::CANCELLED;
			if (!inflater->fill(buffers[0].data(), stride * size_t(strip_rows(i))) ||
			    !unfilterer->take(buffers[0].data(), strip_rows(i)))
				return Ie_Png_Status::NOT_OURS;
		}
		return inflater->finish() ? Ie_Png_Status::DONE : Ie_Png_Status::NOT_OURS;
	}

	/* Inflating on a helper thread, a few strips ahead; the same rows in
	 * the same order as on one thread. */
	Strip_Ring ring;
	bool finished = false;
	auto inflate_all = [&] {
		for (int i = 0; i < strips; i++) {
			{
				std::unique_lock<std::mutex> hold(ring.lock);
				ring.changed.wait(hold, [&] { return ring.abandoned || i - ring.consumed < RING_STRIPS; });
				if (ring.abandoned)
					return;
			}
			const bool ok = inflater->fill(buffers[size_t(i % RING_STRIPS)].data(), stride * size_t(strip_rows(i)));
			std::lock_guard<std::mutex> hold(ring.lock);
			ring.failed = !ok;
			ring.produced = ok ? i + 1 : ring.produced;
			ring.changed.notify_all();
			if (!ok)
				return;
		}
		finished = inflater->finish();
	};
	std::thread helper;
	try {
		helper = std::thread(inflate_all);
	} catch (const std::system_error &) {
		return Ie_Png_Status::NOT_OURS;
	}
	Ie_Png_Status status = Ie_Png_Status::DONE;
	for (int i = 0; i < strips && status == Ie_Png_Status::DONE; i++) {
		bool ready;
		{
			std::unique_lock<std::mutex> hold(ring.lock);
			ring.changed.wait(hold, [&] { return ring.failed || ring.produced > i; });
			ready = ring.produced > i;
		}
		if (!ready || !unfilterer->take(buffers[size_t(i % RING_STRIPS)].data(), strip_rows(i)))
			status = Ie_Png_Status::NOT_OURS;
		else if (stop && stop(stop_data))
			status = Ie_Png_Status::CANCELLED;
		std::lock_guard<std::mutex> hold(ring.lock);
		ring.consumed = i + 1;
		ring.abandoned = status != Ie_Png_Status::DONE;
		ring.changed.notify_all();
	}
	helper.join();
	if (status == Ie_Png_Status::DONE && !finished)
		status = Ie_Png_Status::NOT_OURS;
	return status;
}
