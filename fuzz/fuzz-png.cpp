/* Our own PNG decoding, on one thread and pipelined on two: every row it
 * gives is read, and both must give the same rows. The CRCs are mended
 * (fuzz-png-crc.h). */
#include <cstring>
#include <vector>

#include "fuzz-png-crc.h"
#include "ie-engine-private.h"
#include "ie-image-png.h"

namespace {

struct Rows {
	int w;
	std::vector<uint8_t> seen;
};

void take_rows(void *data, const uint8_t *rows, int count)
{
	auto *r = static_cast<Rows *>(data);
	r->seen.insert(r->seen.end(), rows, rows + size_t(r->w) * 4 * size_t(count));
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *bytes, size_t size)
{
	const std::vector<uint8_t> png = png_crcs_mended(bytes, size);
	const uint8_t *data = png.data();
	int w, h;
	bool alpha;
	if (!ie_png_probe(data, size, &w, &h, &alpha))
		return 0;
	Rows single{ w, {} }, pipelined{ w, {} };
	iel_thread_count_set(1);
	const Ie_Png_Status one = ie_png_decode(data, size, take_rows, &single, nullptr, nullptr);
	iel_thread_count_set(2);
	const Ie_Png_Status two = ie_png_decode(data, size, take_rows, &pipelined, nullptr, nullptr);
	if (one != two || (one == Ie_Png_Status::DONE && single.seen != pipelined.seen))
		__builtin_trap();
	return 0;
}
