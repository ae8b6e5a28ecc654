/* Opens the picture file for the loader; see ie-image-source.h. Evas is
 * given the file opened here, never the path: a name swapped between the
 * checks and the decoding could otherwise block the main loop on a FIFO or
 * get past the checks with another file. */
#include "ie-image-source.h"

#include <Evas.h>
#include <fcntl.h>
#include <libexif/exif-data.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

#include "editor-svc-private.h"

namespace {

constexpr uint8_t JPEG_MARK = 0xFF;
constexpr uint8_t JPEG_STUFFED = 0x00; /* a data byte 0xFF, not a marker */
constexpr uint8_t JPEG_TEM = 0x01;
constexpr uint8_t JPEG_RST0 = 0xD0, JPEG_RST7 = 0xD7;
constexpr uint8_t JPEG_SOI = 0xD8, JPEG_EOI = 0xD9, JPEG_SOS = 0xDA;
constexpr uint8_t JPEG_APP1 = 0xE1;
constexpr uint8_t JPEG_START[] = { 0xFF, 0xD8, 0xFF };
constexpr uint8_t EXIF_HEADER[] = { 'E', 'x', 'i', 'f', 0, 0 };

constexpr uint8_t PNG_SIGNATURE[] = { 0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n' };
constexpr size_t PNG_CHUNK_FRAME = 12; /* length, type, CRC */
constexpr uint32_t PNG_LONGEST_CHUNK = 0x7FFFFFFF;

constexpr int ORIENTATION_UPRIGHT = 1;

struct Fd_Closer {
	int fd;
	~Fd_Closer()
	{
		if (fd >= 0)
			close(fd);
	}
};

struct Exif_Unref {
	void operator()(ExifData *exif) const { exif_data_unref(exif); }
};

template <size_t N> bool starts_with(const uint8_t *data, size_t size, const uint8_t (&prefix)[N])
{
	return size >= N && memcmp(data, prefix, N) == 0;
}

uint32_t be32(const uint8_t *p)
{
	return uint32_t(p[0]) << 24 | uint32_t(p[1]) << 16 | uint32_t(p[2]) << 8 | p[3];
}

/* Orientation of an EXIF block ("Exif\0\0" and its TIFF data), read as
 * written: libexif must not fill in missing tags. */
int exif_orientation(const uint8_t *block, size_t size)
{
	std::unique_ptr<ExifData, Exif_Unref> exif(exif_data_new());
	if (!exif)
		return ORIENTATION_UPRIGHT;
	exif_data_unset_option(exif.get(), EXIF_DATA_OPTION_FOLLOW_SPECIFICATION);
	exif_data_load_data(exif.get(), block, (unsigned int)size);
	ExifEntry *entry = exif_content_get_entry(exif->ifd[EXIF_IFD_0], EXIF_TAG_ORIENTATION);
	if (!entry || entry->format != EXIF_FORMAT_SHORT || entry->components < 1 || entry->size < 2)
		return ORIENTATION_UPRIGHT;
	int value = exif_get_short(entry->data, exif_data_get_byte_order(exif.get()));
	return value >= 1 && value <= 8 ? value : ORIENTATION_UPRIGHT;
}

/* Walks the segments and the entropy-coded data to the end-of-image
 * marker. Stray bytes between segments are passed over as the decoder
 * passes over them; only running out of file before the marker counts. The
 * first EXIF block before the image data gives the orientation, whatever
 * segments come before it. */
Ie_Image_Facts jpeg_facts(const uint8_t *data, size_t size)
{
	Ie_Image_Facts facts = { false, ORIENTATION_UPRIGHT };
	bool exif_seen = false, in_image_data = false;
	size_t pos = sizeof(JPEG_START) - 1;
	for (;;) {
		const void *mark = memchr(data + pos, JPEG_MARK, size - pos);
		if (!mark)
			return facts;
		pos = size_t(static_cast<const uint8_t *>(mark) - data);
		while (pos < size && data[pos] == JPEG_MARK)
			pos++;
		if (pos >= size)
			return facts;
		const uint8_t marker = data[pos++];
		if (marker == JPEG_EOI) {
			facts.complete = true;
			return facts;
		}
		if (marker == JPEG_STUFFED || marker == JPEG_TEM || marker == JPEG_SOI ||
		    (marker >= JPEG_RST0 && marker <= JPEG_RST7))
			continue;
		if (size - pos < 2)
			return facts;
		const size_t length = size_t(data[pos]) << 8 | data[pos + 1];
		if (length < 2 || size - pos < length)
			return facts;
		const uint8_t *body = data + pos + 2;
		const size_t body_size = length - 2;
		if (marker == JPEG_APP1 && !exif_seen && !in_image_data && starts_with(body, body_size, EXIF_HEADER)) {
			exif_seen = true;
			facts.orientation = exif_orientation(body, body_size);
		}
		if (marker == JPEG_SOS)
			in_image_data = true;
		pos += length;
	}
}

/* Every chunk whole, up to IEND; what follows IEND is not the picture's. */
Ie_Image_Facts png_facts(const uint8_t *data, size_t size)
{
	Ie_Image_Facts facts = { false, ORIENTATION_UPRIGHT };
	size_t pos = sizeof(PNG_SIGNATURE);
	while (size - pos >= PNG_CHUNK_FRAME) {
		const uint32_t length = be32(data + pos);
		if (length > PNG_LONGEST_CHUNK || size - pos - PNG_CHUNK_FRAME < length)
			return facts;
		const bool end = memcmp(data + pos + 4, "IEND", 4) == 0;
		pos += PNG_CHUNK_FRAME + length;
		if (end) {
			facts.complete = true;
			return facts;
		}
	}
	return facts;
}

void log_refusal(const char *reason)
{
	IE_LOG_E("could not load image. error string is \"%s\"\n", reason);
}

const char *errno_reason(int error)
{
	switch (error) {
	case ENOENT:
	case ENOTDIR:
		return evas_load_error_str(EVAS_LOAD_ERROR_DOES_NOT_EXIST);
	case EACCES:
	case EPERM:
		return evas_load_error_str(EVAS_LOAD_ERROR_PERMISSION_DENIED);
	case ENOMEM:
		return evas_load_error_str(EVAS_LOAD_ERROR_RESOURCE_ALLOCATION_FAILED);
	default:
		return strerror(error);
	}
}

} // namespace

Ie_Image_Facts ie_image_facts_get(const uint8_t *data, size_t size)
{
	if (starts_with(data, size, JPEG_START))
		return jpeg_facts(data, size);
	if (starts_with(data, size, PNG_SIGNATURE))
		return png_facts(data, size);
	return { true, ORIENTATION_UPRIGHT };
}

bool ie_image_source_open(const char *path, Ie_Image_Source *source)
{
	*source = { NULL, ORIENTATION_UPRIGHT };

	/* A device, FIFO or socket is refused by its name, without opening it:
	 * opening a FIFO blocks until a writer comes, and a device may act on
	 * being opened. */
	struct stat st;
	if (stat(path, &st) != 0) {
		log_refusal(errno_reason(errno));
		return false;
	}
	if (!S_ISREG(st.st_mode)) {
		log_refusal("not a regular file");
		return false;
	}
	/* Without blocking even so, and checked again through the descriptor:
	 * the name may have been swapped since. */
	Fd_Closer fd{ open(path, O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOCTTY) };
	if (fd.fd < 0) {
		log_refusal(errno_reason(errno));
		return false;
	}
	if (fstat(fd.fd, &st) != 0 || !S_ISREG(st.st_mode)) {
		log_refusal("not a regular file");
		return false;
	}
	if (st.st_size <= 0) {
		log_refusal(evas_load_error_str(EVAS_LOAD_ERROR_UNKNOWN_FORMAT));
		return false;
	}

	/* The descriptor's own link opens the very file checked above, whatever
	 * has become of its name, without a copy of its bytes; only where /proc
	 * is missing does the name serve. */
	char link[sizeof("/proc/self/fd/") + 3 * sizeof(int)];
	snprintf(link, sizeof(link), "/proc/self/fd/%d", fd.fd);
	Eina_File *file = eina_file_open(link, EINA_FALSE);
	if (!file)
		file = eina_file_open(path, EINA_FALSE);
	if (!file) {
		log_refusal(errno_reason(errno));
		return false;
	}

	/* What the decoder will read is checked through the same map. */
	const size_t size = eina_file_size_get(file);
	const auto *data = static_cast<const uint8_t *>(eina_file_map_all(file, EINA_FILE_SEQUENTIAL));
	if (!data) {
		eina_file_close(file);
		log_refusal(evas_load_error_str(EVAS_LOAD_ERROR_RESOURCE_ALLOCATION_FAILED));
		return false;
	}
	Ie_Image_Facts facts = ie_image_facts_get(data, size);
	eina_file_map_free(file, const_cast<uint8_t *>(data));
	if (!facts.complete) {
		eina_file_close(file);
		log_refusal(evas_load_error_str(EVAS_LOAD_ERROR_CORRUPT_FILE));
		return false;
	}
	source->file = file;
	source->orientation = facts.orientation;
	return true;
}

void ie_image_source_close(Ie_Image_Source *source)
{
	if (source->file)
		eina_file_close(source->file);
	source->file = NULL;
}
