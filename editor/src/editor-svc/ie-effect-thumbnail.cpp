/* The effect thumbnails: the picture scaled once per opening of the effect
 * view (and copied at full size as the base of every effect), and for each
 * grid item that small picture under the item's effect, shown as a
 * 118 x 118 square cut from its centre. Also the two steps thumbnails and
 * full-size effects share: the pixel buffer and the effect run that tells
 * a failed effect from a picture. */
#include <libintl.h>

#include <cstring>
#include <memory>

#include "editor-svc-private.h"
#include "ie-effect-hooks.h"
#include "ie-engine.h"
#include "ie-image.h"
#include "ie-malloc-ptr.h"

namespace {

constexpr int THUMB_SIDE = 118;

using Pixel_Buffer = Ie_Malloc_Ptr<unsigned char>;

bool all_zero(const unsigned char *bytes, size_t count)
{
	for (size_t i = 0; i < count; i++)
		if (bytes[i])
			return false;
	return true;
}

/* Wide pictures fill the square with their middle columns, tall ones with
 * their middle rows. The fill repeats with its own size as period, so an
 * offset of side + overflow / 2 shows the same pixels as -overflow / 2. */
void thumbnail_fill_set(Evas_Object *image, int iw, int ih)
{
	float ratio = static_cast<float>(iw) / static_cast<float>(ih);
	int wide_w = static_cast<int>(ratio * static_cast<float>(THUMB_SIDE));
	int tall_h = static_cast<int>(static_cast<float>(THUMB_SIDE) / ratio);
	bool wide = (ratio > 1.0f && wide_w > THUMB_SIDE - 1) || (ratio <= 1.0f && tall_h <= THUMB_SIDE - 1);

	if (wide && wide_w > THUMB_SIDE) {
		evas_object_image_load_size_set(image, wide_w, THUMB_SIDE);
		evas_object_image_fill_set(image, THUMB_SIDE + ((wide_w - THUMB_SIDE) >> 1), 0, wide_w, THUMB_SIDE);
	} else if (!wide && tall_h > THUMB_SIDE) {
		evas_object_image_load_size_set(image, THUMB_SIDE, tall_h);
		evas_object_image_fill_set(image, 0, THUMB_SIDE + ((tall_h - THUMB_SIDE) >> 1), THUMB_SIDE, tall_h);
	} else {
		evas_object_image_load_size_set(image, THUMB_SIDE, THUMB_SIDE);
		evas_object_image_fill_set(image, 0, 0, THUMB_SIDE, THUMB_SIDE);
	}
}

void _thumbnail_preloaded_cb(void *, Evas *, Evas_Object *obj, void *)
{
	evas_object_show(obj);
}

} // namespace

Ie_Effect_Hooks ie_effect_hooks;

unsigned char *ie_effect_buffer_new(size_t bytes)
{
	if (ie_effect_hooks.refuse_buffer && ie_effect_hooks.refuse_buffer(bytes))
		return NULL;
	return static_cast<unsigned char *>(calloc(1, bytes));
}

/* The dispatcher counts an effect library's refusal as done and leaves the
 * zero-filled output as it was: an all-zero result of a picture that is not
 * all zero is such a refusal, never a picture to show. */
Eina_Bool ie_effect_run(IEL_Image *source, IEL_Image *output, int row)
{
	if (row < 1 || row >= IE_EFFECT_TABLE_ROWS)
		return EINA_FALSE;
	int code = ie_effect_hooks.effect_code ? ie_effect_hooks.effect_code(row) : effect_table[row].effect;
	if (IEL_Run_Effect(source, output, static_cast<unsigned int>(code)) != IEL_OK)
		return EINA_FALSE;
	size_t bytes = static_cast<size_t>(source->u32Width) * source->u32Height * 4;
	return !(all_zero(output->pbBuf, bytes) && !all_zero(source->pbBuf, bytes));
}

void SetThumbnailBuffer(Viewhandle *vh)
{
	IE_CHECK_AS(vh, "data");

	Evas_Object *inner = ie_image_object_get(vh->main_image);
	int w = 0, h = 0;
	if (inner)
		evas_object_image_size_get(inner, &w, &h);
	if (w > 0 && h > 0) {
		if (w >= h) {
			vh->thumb_height = THUMB_SIDE;
			vh->thumb_width = static_cast<int32_t>(static_cast<int64_t>(THUMB_SIDE) * w / h);
		} else {
			vh->thumb_width = THUMB_SIDE;
			vh->thumb_height = static_cast<int32_t>(static_cast<int64_t>(THUMB_SIDE) * h / w);
		}
	}

	auto *pixels = static_cast<unsigned char *>(ie_image_data_get(vh->main_image));
	if (!pixels) {
		IE_LOG_E("Image Internal Buffer Get Failed");
		return;
	}

	free(vh->thumb_buf);
	vh->thumb_buf = NULL;
	Pixel_Buffer thumb(ie_effect_buffer_new(static_cast<size_t>(vh->thumb_width) * vh->thumb_height * 4));
	if (!thumb) {
		IE_LOG_E("inter.pbBuf is null ,Calloc failed");
		return;
	}
	IEL_Image picture = {static_cast<uint32_t>(w), static_cast<uint32_t>(h), IEL_FORMAT_BGRA8888, pixels};
	IEL_Image scaled = {static_cast<uint32_t>(vh->thumb_width), static_cast<uint32_t>(vh->thumb_height),
			    IEL_FORMAT_BGRA8888, thumb.get()};
	if (IEL_Resize_Image(&picture, &scaled) != IEL_OK) {
		IE_LOG_E("the picture cannot be scaled for the thumbnails");
		return;
	}
	vh->thumb_buf = thumb.release();

	free(vh->orig_buf);
	vh->orig_buf = NULL;
	size_t bytes = static_cast<size_t>(w) * h * 4;
	unsigned char *copy = ie_effect_buffer_new(bytes);
	if (!copy) {
		IE_LOG_E("main_image_buf  is null Calloc failed");
		free(vh->thumb_buf);
		vh->thumb_buf = NULL;
		return;
	}
	memcpy(copy, pixels, bytes);
	vh->orig_buf = copy;
	/* The size orig_buf holds: every full-size effect and blend is made at it. */
	vh->image_width = w;
	vh->image_height = h;
}

Evas_Object *_effect_content_get(void *data, Evas_Object *, const char *part)
{
	auto *item = static_cast<Ie_Data_Item *>(data);
	IE_CHECK_NULL_AS(item, "data");
	if (!part || strcmp(part, "elm.swallow.icon"))
		return NULL;

	Viewhandle *vh = item->viewhandle;
	if (!vh->thumb_buf)
		return NULL;
	int tw = vh->thumb_width, th = vh->thumb_height;
	size_t bytes = static_cast<size_t>(tw) * th * 4;
	Pixel_Buffer output(ie_effect_buffer_new(bytes));
	if (!output) {
		IE_LOG_E("Output.pbBuf is null, Calloc Failed ");
		return NULL;
	}
	IEL_Image source = {static_cast<uint32_t>(tw), static_cast<uint32_t>(th), IEL_FORMAT_BGRA8888, vh->thumb_buf};
	IEL_Image result = {static_cast<uint32_t>(tw), static_cast<uint32_t>(th), IEL_FORMAT_BGRA8888, output.get()};
	if (!ie_effect_run(&source, &result, item->index)) {
		IE_LOG_E("_thumbnail_generate: effect of row %d failed", item->index);
		return NULL;
	}

	Evas_Object *image = evas_object_image_add(evas_object_evas_get(vh->layout));
	evas_object_image_size_set(image, tw, th);
	void *pixels = evas_object_image_data_get(image, EINA_TRUE);
	if (!pixels) {
		IE_LOG_E("_thumbnail_generate: no pixels for row %d", item->index);
		evas_object_del(image);
		return NULL;
	}
	memcpy(pixels, output.get(), bytes);
	evas_object_image_data_set(image, pixels);

	evas_object_event_callback_add(image, EVAS_CALLBACK_IMAGE_PRELOADED, _thumbnail_preloaded_cb, NULL);
	evas_object_image_alpha_set(image, EINA_FALSE);
	evas_object_image_scale_hint_set(image, EVAS_IMAGE_SCALE_HINT_STATIC);
	evas_object_image_smooth_scale_set(image, EINA_TRUE);

	int iw = 0, ih = 0;
	evas_object_image_size_get(image, &iw, &ih);
	if (iw == 0 || ih == 0) {
		evas_object_del(image);
		return NULL;
	}
	thumbnail_fill_set(image, iw, ih);
	evas_object_resize(image, THUMB_SIDE, THUMB_SIDE);
	evas_object_image_preload(image, EINA_FALSE);
	return image;
}

char *_effect_text_get(void *data, Evas_Object *, const char *part)
{
	auto *item = static_cast<Ie_Data_Item *>(data);
	IE_CHECK_NULL_AS(item, "data");
	if (!part || strcmp(part, "elm.text.title") || item->index < 1 || item->index >= IE_EFFECT_TABLE_ROWS)
		return NULL;
	return strdup(dgettext(IE_TEXT_DOMAIN, effect_table[item->index].text_id));
}
