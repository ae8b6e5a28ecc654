/* Puts the picture into the main image object. A picture with more pixels
 * than the host's box is reduced so that its long side equals the box's
 * longer side: small reductions at once, large ones in the background
 * while a processing popup shows. JPEG and PNG are reduced by our own
 * decoding (the decoder's scale-down, then an area average), on a worker
 * thread when in the background; other formats, and GIF/WBMP by name, by
 * Evas (scale-down then a bilinear resample at once, an offscreen buffer
 * canvas preloaded in the background). The EXIF orientation is read from
 * the file by us and applied to the pixels by us on every path, as they go
 * into the image: Evas's own reading misses a block that another segment
 * precedes. */
#include <Ecore_Evas.h>
#include <Elementary.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <memory>

#include "editor-svc-private.h"
#include "ie-engine.h"
#include "ie-image-decode.h"
#include "ie-image-private.h"
#include "ie-image-source.h"
#include "ie-malloc-ptr.h"

namespace {

constexpr const char *PRELOAD_EE_KEY = "Ecore_Evas";
constexpr const char *PRELOAD_WIDTH_KEY = "preload_object_width";
constexpr const char *PRELOAD_HEIGHT_KEY = "preload_object_height";

/* Formats the decoder cannot scale down; always loaded in the background. */
constexpr const char *ASYNC_FORMAT_MARKS[] = { ".gif", ".GIF", ".wbmp", ".WBMP" };

/* Evas keeps image sides below this; a larger target cannot be held. */
constexpr int MAX_IMAGE_SIDE = 32767;

enum class Load_Path { FULL_SIZE, RESAMPLED, ASYNC };

struct Load_Plan {
	Load_Path path;
	int scale_down; /* decoder scale-down factor, 0 for none */
	int target_w, target_h; /* as shown upright */
	int orientation;	/* EXIF, of the stored pixels */
	bool ours;		/* reduced by our own decoding, not by Evas */
};

/* EXIF orientation 1 stores the picture upright; 5 to 8 store it a quarter
 * turned, its rows being the upright picture's columns. */
constexpr int UPRIGHT = 1;
constexpr int FIRST_TURNED_ORIENTATION = 5;

struct Evas_Object_Deleter {
	void operator()(Evas_Object *obj) const { evas_object_del(obj); }
};
using Evas_Object_Ptr = std::unique_ptr<Evas_Object, Evas_Object_Deleter>;

/* Evas holds its own references to the file once the images have it. */
struct Source_Closer {
	Ie_Image_Source *source;
	~Source_Closer() { ie_image_source_close(source); }
};

/* The size of a w x h picture seen the other way: as stored when w x h is
 * upright, upright when it is as stored. */
void turned_size(int orientation, int w, int h, int *turned_w, int *turned_h)
{
	const bool turned = orientation >= FIRST_TURNED_ORIENTATION;
	*turned_w = turned ? h : w;
	*turned_h = turned ? w : h;
}

/* The file's bytes, mapped for as long as the load needs them. */
struct File_Map {
	Eina_File *file;
	const uint8_t *data;
	size_t size;
	explicit File_Map(Eina_File *f)
		: file(f), data(static_cast<const uint8_t *>(eina_file_map_all(f, EINA_FILE_SEQUENTIAL))),
		  size(eina_file_size_get(f))
	{
	}
	~File_Map()
	{
		if (data)
			eina_file_map_free(file, const_cast<uint8_t *>(data));
	}
	File_Map(const File_Map &) = delete;
	File_Map &operator=(const File_Map &) = delete;
};

} // namespace

static void _print_image_load_err(Evas_Load_Error error)
{
	IE_LOG_E("could not load image. error string is \"%s\"\n", evas_load_error_str(error));
}

/* A plain substring test anywhere in the path. */
static bool _named_like_gif_or_wbmp(const char *path)
{
	return std::any_of(std::begin(ASYNC_FORMAT_MARKS), std::end(ASYNC_FORMAT_MARKS),
			   [path](const char *mark) { return strstr(path, mark) != NULL; });
}

/* Chooses how a picture of iw x ih goes into a box of box_w x box_h. Sizes
 * are multiplied in 64 bits: the host's box and the file's header are not
 * trusted to keep products within int. A picture larger than our decoders
 * take is refused whoever would decode it: Evas would hold it whole. */
static bool _load_plan_get(const char *path, int iw, int ih, int box_w, int box_h, Load_Plan *plan)
{
	if (!ie_decode_size_ok(iw, ih) || box_w < 0 || box_h < 0)
		return false;

	if ((int64_t)iw * ih <= (int64_t)box_w * box_h) {
		*plan = { Load_Path::FULL_SIZE, 0, iw, ih, UPRIGHT, false };
		return true;
	}

	int64_t longest = std::max(box_w, box_h);
	if (longest <= 0)
		return false;

	int64_t tw, th, r;
	if (iw > ih) {
		tw = longest;
		th = longest * ih / iw;
		r = iw;
	} else {
		th = longest;
		tw = longest * iw / ih;
		r = ih;
	}
	/* A very thin picture must not shrink to nothing on its short side. */
	tw = std::max<int64_t>(tw, 1);
	th = std::max<int64_t>(th, 1);
	if (tw > MAX_IMAGE_SIDE || th > MAX_IMAGE_SIDE)
		return false;
	plan->target_w = (int)tw;
	plan->target_h = (int)th;

	if (_named_like_gif_or_wbmp(path)) {
		plan->path = Load_Path::ASYNC;
		plan->scale_down = 0;
	} else if (r <= 2 * longest) {
		plan->path = Load_Path::RESAMPLED;
		plan->scale_down = 1;
	} else if (r <= 3 * longest) {
		plan->path = Load_Path::RESAMPLED;
		plan->scale_down = 2;
	} else if (r <= 4 * longest) {
		plan->path = Load_Path::ASYNC;
		plan->scale_down = 3;
	} else {
		plan->path = Load_Path::ASYNC;
		plan->scale_down = 4;
	}
	return true;
}

/* Decodes the image's pixels now, so that a damaged or oversized file fails
 * the load instead of showing an empty picture later. */
static const void *_image_pixels_decode(Evas_Object *image)
{
	const void *pixels = evas_object_image_data_get(image, EINA_FALSE);
	Evas_Load_Error error = evas_object_image_load_error_get(image);
	if (error != EVAS_LOAD_ERROR_NONE) {
		_print_image_load_err(error);
		return NULL;
	}
	if (!pixels)
		_print_image_load_err(EVAS_LOAD_ERROR_GENERIC);
	return pixels;
}

/* The picture's bytes, with Evas's orientation reading off: the
 * orientation is ours to apply. */
static void _image_source_set(Evas_Object *image, const Ie_Image_Source &source)
{
	evas_object_image_load_orientation_set(image, EINA_FALSE);
	evas_object_image_mmap_set(image, source.file, NULL);
}

/* Replaces what the image holds with `pixels` (w x h as stored) turned
 * upright: the turn writes into a buffer the main image then takes over
 * and shows as it is, so putting the pixels in place costs no more than
 * the copy it replaces, and a later crop can work within that buffer. On
 * failure the image is left empty. */
static bool _image_pixels_put(Mainimg_Smart_Data *sd, const void *pixels, int w, int h, int orientation,
			      Eina_Bool alpha)
{
	int upright_w, upright_h;
	turned_size(orientation, w, h, &upright_w, &upright_h);
	Evas_Object *image = sd->image;
	evas_object_image_file_set(image, NULL, NULL);
	evas_object_image_alpha_set(image, alpha);
	size_t bytes = 0;
	Ie_Malloc_Ptr<uint8_t> upright;
	if (upright_w > 0 && upright_h > 0 &&
	    !__builtin_mul_overflow((size_t)upright_w * (size_t)upright_h, (size_t)4, &bytes))
		upright.reset(static_cast<uint8_t *>(malloc(bytes)));
	if (!upright) {
		IE_LOG_E("Cannot hold a %dx%d picture", upright_w, upright_h);
		evas_object_image_data_set(image, NULL);
		return false;
	}
	IEL_Image from = { (uint32_t)w, (uint32_t)h, IEL_FORMAT_BGRA8888,
			   static_cast<uint8_t *>(const_cast<void *>(pixels)) };
	IEL_Image to = { 0, 0, IEL_FORMAT_BGRA8888, upright.get() };
	int result = IEL_Orient_Image(&from, &to, (unsigned int)orientation);
	if (result != IEL_OK) {
		IE_LOG_E("IEL_Orient_Image failed (%d)", result);
		evas_object_image_data_set(image, NULL);
		return false;
	}
	return ie_image_pixels_take(sd->obj, upright.release(), upright_w, upright_h);
}

/* An image that has read the file's header, or NULL (the error logged). */
static Evas_Object_Ptr _probe_open(Evas_Object *obj, const Ie_Image_Source &source)
{
	Evas_Object_Ptr probe(evas_object_image_add(evas_object_evas_get(obj)));
	if (!probe) {
		IE_LOG_E("Cannot create probe image");
		return probe;
	}
	_image_source_set(probe.get(), source);
	Evas_Load_Error error = evas_object_image_load_error_get(probe.get());
	if (error != EVAS_LOAD_ERROR_NONE) {
		_print_image_load_err(error);
		probe.reset();
	}
	return probe;
}

/* A probe decodes the file and the turn (a plain copy for an upright
 * picture) puts it into the main image's own buffer, where the views
 * rework it in place instead of trading Evas's buffers. */
static bool _load_full_size(Mainimg_Smart_Data *sd, Evas_Object_Ptr probe, const Ie_Image_Source &source,
			    const Load_Plan &plan)
{
	if (!probe)
		probe = _probe_open(sd->obj, source);
	if (!probe)
		return false;
	const void *pixels = _image_pixels_decode(probe.get());
	int sw = 0, sh = 0;
	evas_object_image_size_get(probe.get(), &sw, &sh);
	if (!pixels || !_image_pixels_put(sd, pixels, sw, sh, plan.orientation, evas_object_image_alpha_get(probe.get())))
		return false;
	sd->img_w = plan.target_w;
	sd->img_h = plan.target_h;
	return true;
}

/* Resampled as stored, then turned upright on the way into the image. */
static bool _load_resampled(Mainimg_Smart_Data *sd, const Ie_Image_Source &source, const Load_Plan &plan)
{
	Evas_Object *image = sd->image;
	/* Load options go before the file, so the header is read only once. */
	evas_object_image_load_scale_down_set(image, plan.scale_down);
	_image_source_set(image, source);

	const void *pixels = _image_pixels_decode(image);
	int sw = 0, sh = 0;
	evas_object_image_size_get(image, &sw, &sh);
	if (!pixels || sw <= 0 || sh <= 0) {
		evas_object_image_file_set(image, NULL, NULL);
		return false;
	}

	int stored_w, stored_h;
	turned_size(plan.orientation, plan.target_w, plan.target_h, &stored_w, &stored_h);
	size_t bytes = 0;
	Ie_Malloc_Ptr<uint8_t> buf;
	if (!__builtin_mul_overflow((size_t)stored_w * (size_t)stored_h, (size_t)4, &bytes))
		buf.reset(static_cast<uint8_t *>(calloc(1, bytes)));
	if (!buf) {
		IE_LOG_E("inter.pbBuf is null ,Calloc failed");
		evas_object_image_file_set(image, NULL, NULL);
		return false;
	}

	IEL_Image src = { (uint32_t)sw, (uint32_t)sh, IEL_FORMAT_BGRA8888,
			  static_cast<uint8_t *>(const_cast<void *>(pixels)) };
	IEL_Image inter = { (uint32_t)stored_w, (uint32_t)stored_h, IEL_FORMAT_BGRA8888, buf.get() };
	int result = IEL_Resize_Image(&src, &inter);
	if (result != IEL_OK) {
		IE_LOG_E("IEL_Resize_Image failed (%d)", result);
		evas_object_image_file_set(image, NULL, NULL);
		return false;
	}

	/* From here the pixels are ours, not the file's: Evas must never reload
	 * the full-size file over them. */
	if (!_image_pixels_put(sd, buf.get(), stored_w, stored_h, plan.orientation,
			       evas_object_image_alpha_get(image)))
		return false;
	sd->img_w = plan.target_w;
	sd->img_h = plan.target_h;
	return true;
}

/* Our decoding's pixels, as stored, turned upright into the image. */
static bool _decoded_put(Mainimg_Smart_Data *sd, Ie_Decode_Status status, const Ie_Decoded &decoded)
{
	if (status != Ie_Decode_Status::DONE) {
		_print_image_load_err(EVAS_LOAD_ERROR_CORRUPT_FILE);
		return false;
	}
	return _image_pixels_put(sd, decoded.pixels, decoded.w, decoded.h, sd->orientation, decoded.alpha);
}

static bool _load_decoded_now(Mainimg_Smart_Data *sd, const File_Map &map, const Load_Plan &plan)
{
	int stored_w, stored_h;
	turned_size(plan.orientation, plan.target_w, plan.target_h, &stored_w, &stored_h);
	Ie_Decoded decoded;
	Ie_Decode_Status status = ie_image_decode(map.data, map.size, stored_w, stored_h, NULL, NULL, &decoded);
	Ie_Malloc_Ptr<uint8_t> pixels(decoded.pixels);
	sd->orientation = plan.orientation;
	if (!_decoded_put(sd, status, decoded))
		return false;
	sd->img_w = plan.target_w;
	sd->img_h = plan.target_h;
	return true;
}

/* The popup lives on the parent: if the parent goes first, forget it. */
static void _processing_popup_deleted_cb(void *data, Evas *e, Evas_Object *popup, void *event_info)
{
	(void)e;
	(void)event_info;
	auto *sd = static_cast<Mainimg_Smart_Data *>(data);
	if (sd->processing_popup == popup)
		sd->processing_popup = NULL;
}

static Evas_Object *_processing_popup_create(Mainimg_Smart_Data *sd)
{
	Evas_Object *popup = ie_processing_popup_add(sd->parent, "IDS_360V_TPOP_LOADING_ING");
	if (!popup)
		return NULL;
	evas_object_event_callback_add(popup, EVAS_CALLBACK_DEL, _processing_popup_deleted_cb, sd);
	return popup;
}

void _processing_popup_del(Mainimg_Smart_Data *sd)
{
	if (!sd->processing_popup)
		return;
	Evas_Object *popup = sd->processing_popup;
	sd->processing_popup = NULL;
	evas_object_event_callback_del_full(popup, EVAS_CALLBACK_DEL, _processing_popup_deleted_cb, sd);
	evas_object_del(popup);
}

static void _on_image_preloaded(void *data, Evas *e, Evas_Object *preload_image, void *event_info);

/* A decoding on the worker thread. The job belongs to the thread's
 * callbacks, which free it; the main image only points at it and lets go
 * by clearing `owner`. */
struct Decode_Job {
	Eina_File *file;
	int target_w, target_h; /* as stored */
	Evas_Object *owner;	/* the main image, NULL once it no longer waits */
	Ie_Decode_Status status;
	Ie_Decoded decoded;
};

static void _decode_job_free(Decode_Job *job)
{
	free(job->decoded.pixels);
	eina_file_close(job->file);
	delete job;
}

static void _decode_job_detach(Mainimg_Smart_Data *sd)
{
	if (!sd->decode_job)
		return;
	sd->decode_job->owner = NULL;
	Ecore_Thread *thread = sd->decode_thread;
	sd->decode_job = NULL;
	sd->decode_thread = NULL;
	/* May free the job at once, if it has not started. */
	ecore_thread_cancel(thread);
}

void _preload_release(Mainimg_Smart_Data *sd)
{
	if (sd->load_failed_job) {
		ecore_job_del(sd->load_failed_job);
		sd->load_failed_job = NULL;
	}
	_decode_job_detach(sd);
	if (!sd->preload_image)
		return;
	Evas_Object *preload_image = sd->preload_image;
	sd->preload_image = NULL;
	Ecore_Evas *ee = ecore_evas_object_ecore_evas_get(preload_image);
	evas_object_event_callback_del_full(preload_image, EVAS_CALLBACK_IMAGE_PRELOADED, _on_image_preloaded,
					    sd->obj);
	evas_object_del(preload_image);
	if (ee)
		ecore_evas_free(ee);
}

/* The offscreen image is only needed until its pixels are copied out. */
static void _preload_image_drop_file(Evas_Object *preload_image)
{
	evas_object_hide(preload_image);
	evas_object_image_preload(preload_image, EINA_TRUE);
	evas_object_image_file_set(preload_image, NULL, NULL);
}

static void _load_failed_job_cb(void *data)
{
	Mainimg_Smart_Data *sd = _mainimg_data_get(static_cast<Evas_Object *>(data));
	if (!sd)
		return;
	sd->load_failed_job = NULL;
	evas_object_smart_callback_call(sd->obj, IE_IMAGE_SIGNAL_LOAD_FAILED, NULL);
}

/* What the background load came to, on the main loop: the popup goes
 * down, and a failure is reported once the caller's work is over. */
static void _background_load_done(Mainimg_Smart_Data *sd, bool failed)
{
	if (sd->processing_popup)
		_processing_popup_del(sd);
	else
		sd->preloaded = EINA_TRUE;
	if (sd->preload_starting) {
		sd->preload_failed = failed;
		return;
	}
	if (failed && !sd->load_failed_job)
		sd->load_failed_job = ecore_job_add(_load_failed_job_cb, sd->obj);
}

/* On the worker thread: only the job and the file's bytes are touched. */
static void _decode_job_run(void *data, Ecore_Thread *thread)
{
	auto *job = static_cast<Decode_Job *>(data);
	job->status = Ie_Decode_Status::FAILED;
	/* Mapped whole at once: the decoder reads it all, in order. */
	void *bytes = eina_file_map_all(job->file, EINA_FILE_POPULATE);
	if (!bytes)
		return;
	auto stop = [](void *t) -> bool { return ecore_thread_check(static_cast<Ecore_Thread *>(t)); };
	job->status = ie_image_decode(static_cast<const uint8_t *>(bytes), eina_file_size_get(job->file), job->target_w,
				      job->target_h, stop, thread, &job->decoded);
	eina_file_map_free(job->file, bytes);
}

static Mainimg_Smart_Data *_decode_job_owner(Decode_Job *job)
{
	Mainimg_Smart_Data *sd = job->owner ? _mainimg_data_get(job->owner) : NULL;
	if (!sd || sd->decode_job != job)
		return NULL;
	sd->decode_job = NULL;
	sd->decode_thread = NULL;
	return sd;
}

static void _decode_job_end(void *data, Ecore_Thread *thread)
{
	(void)thread;
	auto *job = static_cast<Decode_Job *>(data);
	Mainimg_Smart_Data *sd = _decode_job_owner(job);
	if (sd)
		_background_load_done(sd, !_decoded_put(sd, job->status, job->decoded));
	_decode_job_free(job);
}

/* Cancelled by us (no owner any more), or by Ecore when the thread could
 * not run: then the load has failed. */
static void _decode_job_cancel(void *data, Ecore_Thread *thread)
{
	(void)thread;
	auto *job = static_cast<Decode_Job *>(data);
	Mainimg_Smart_Data *sd = _decode_job_owner(job);
	if (sd) {
		IE_LOG_E("Cannot decode the picture in the background");
		_background_load_done(sd, true);
	}
	_decode_job_free(job);
}

static bool _load_decoded_in_background(Mainimg_Smart_Data *sd, const Ie_Image_Source &source, const Load_Plan &plan)
{
	auto *job = new (std::nothrow) Decode_Job();
	if (!job) {
		IE_LOG_E("Cannot create the decoding job");
		return false;
	}
	turned_size(plan.orientation, plan.target_w, plan.target_h, &job->target_w, &job->target_h);
	job->file = eina_file_dup(source.file);
	job->owner = sd->obj;
	sd->preloaded = EINA_FALSE;
	sd->orientation = plan.orientation;
	sd->decode_job = job;

	sd->preload_starting = EINA_TRUE;
	sd->preload_failed = EINA_FALSE;
	Ecore_Thread *thread = ecore_thread_run(_decode_job_run, _decode_job_end, _decode_job_cancel, job);
	sd->preload_starting = EINA_FALSE;
	/* Ecore may have given up on the job (and freed it) already. */
	if (sd->decode_job)
		sd->decode_thread = thread;
	if (sd->preload_failed)
		return false;
	if (!sd->preloaded)
		sd->processing_popup = _processing_popup_create(sd);

	sd->img_w = plan.target_w;
	sd->img_h = plan.target_h;
	return true;
}

static void _on_image_preloaded(void *data, Evas *e, Evas_Object *preload_image, void *event_info)
{
	(void)e;
	(void)event_info;
	Mainimg_Smart_Data *sd = _mainimg_data_get(static_cast<Evas_Object *>(data));
	if (!sd || sd->preload_image != preload_image)
		return;

	/* A file that fails while decoding would render as an empty canvas:
	 * such pixels must not pass for the picture. */
	bool failed = false;
	Evas_Load_Error error = evas_object_image_load_error_get(preload_image);
	if (error != EVAS_LOAD_ERROR_NONE) {
		_print_image_load_err(error);
		failed = true;
	} else {
		Ecore_Evas *ee = ecore_evas_object_ecore_evas_get(preload_image);
		evas_object_show(preload_image);
		const void *pixels = ee ? ecore_evas_buffer_pixels_get(ee) : NULL;
		int pw = (int)(intptr_t)evas_object_data_get(preload_image, PRELOAD_WIDTH_KEY);
		int ph = (int)(intptr_t)evas_object_data_get(preload_image, PRELOAD_HEIGHT_KEY);
		if (!pixels) {
			IE_LOG_E("offscreen canvas gave no pixels");
			failed = true;
		} else if (!_image_pixels_put(sd, pixels, pw, ph, sd->orientation,
					      evas_object_image_alpha_get(sd->image))) {
			failed = true;
		}
	}

	/* Reported from inside evas_object_image_preload: the load has not
	 * returned yet, so it drops the file and reports any failure itself. */
	if (!sd->preload_starting)
		_preload_image_drop_file(preload_image);
	_background_load_done(sd, failed);
}

/* The offscreen canvas renders the picture as stored, at the target size;
 * the preload notice turns it upright on the way into the image. */
static bool _load_async(Mainimg_Smart_Data *sd, const Ie_Image_Source &source, const Load_Plan &plan)
{
	int tw, th;
	turned_size(plan.orientation, plan.target_w, plan.target_h, &tw, &th);
	/* The canvas only ever renders the target size: no need for a
	 * full-size buffer first. */
	Ecore_Evas *ee = ecore_evas_buffer_new(tw, th);
	if (!ee) {
		IE_LOG_E("Cannot create offscreen canvas %dx%d", tw, th);
		return false;
	}
	Evas_Object *preload_image = evas_object_image_filled_add(ecore_evas_get(ee));
	if (!preload_image) {
		IE_LOG_E("Cannot create offscreen image");
		ecore_evas_free(ee);
		return false;
	}
	sd->preload_image = preload_image;
	sd->preloaded = EINA_FALSE;
	sd->orientation = plan.orientation;
	evas_object_data_set(preload_image, PRELOAD_EE_KEY, ee);
	evas_object_event_callback_add(preload_image, EVAS_CALLBACK_IMAGE_PRELOADED, _on_image_preloaded, sd->obj);

	if (plan.scale_down > 0)
		evas_object_image_load_scale_down_set(preload_image, plan.scale_down);
	_image_source_set(preload_image, source);
	Evas_Load_Error error = evas_object_image_load_error_get(preload_image);
	if (error != EVAS_LOAD_ERROR_NONE)
		_print_image_load_err(error);

	evas_object_image_fill_set(preload_image, 0, 0, tw, th);
	evas_object_resize(preload_image, tw, th);
	evas_object_data_set(preload_image, PRELOAD_WIDTH_KEY, (void *)(intptr_t)tw);
	evas_object_data_set(preload_image, PRELOAD_HEIGHT_KEY, (void *)(intptr_t)th);

	sd->preload_starting = EINA_TRUE;
	sd->preload_failed = EINA_FALSE;
	evas_object_image_preload(preload_image, EINA_FALSE);
	sd->preload_starting = EINA_FALSE;

	if (sd->preload_failed) {
		_preload_release(sd);
		return false;
	}
	if (sd->preloaded)
		_preload_image_drop_file(preload_image);
	else
		sd->processing_popup = _processing_popup_create(sd);

	sd->img_w = plan.target_w;
	sd->img_h = plan.target_h;
	return true;
}

Eina_Bool ie_image_file_load(Evas_Object *obj, const char *path, int width, int height)
{
	IE_CHECK_VAL(obj, EINA_FALSE);
	IE_CHECK_VAL(path, EINA_FALSE);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK_VAL(sd, EINA_FALSE);

	if (sd->loaded) {
		sd->loaded = EINA_FALSE;
		free(sd->path);
		sd->path = NULL;
		return EINA_FALSE;
	}
	/* A background load of an earlier picture must not land on this one. */
	_preload_release(sd);
	_processing_popup_del(sd);

	Ie_Image_Source source;
	if (!ie_image_source_open(path, &source))
		return EINA_FALSE;
	Source_Closer source_closer{ &source };

	/* Our decoder reads the header of the files it takes; Evas reads the
	 * others', and is then the one to decode them. */
	File_Map map(source.file);
	int sw = 0, sh = 0;
	const bool decodable = map.data && ie_image_decode_probe(map.data, map.size, &sw, &sh);
	Evas_Object_Ptr probe;
	if (!decodable) {
		probe = _probe_open(obj, source);
		if (!probe)
			return EINA_FALSE;
		evas_object_image_size_get(probe.get(), &sw, &sh);
	}

	/* Sizes and steps go by the picture as shown upright. */
	int iw, ih;
	turned_size(source.orientation, sw, sh, &iw, &ih);
	Load_Plan plan = {};
	if (!_load_plan_get(path, iw, ih, width, height, &plan)) {
		IE_LOG_E("Cannot hold a %dx%d picture in a %dx%d box", iw, ih, width, height);
		return EINA_FALSE;
	}
	plan.orientation = source.orientation;
	/* Ours only reduces; a box larger than the picture on a side (it has
	 * more pixels all the same) is left to Evas's resampling. */
	plan.ours = decodable && plan.path != Load_Path::FULL_SIZE && !_named_like_gif_or_wbmp(path) &&
		    std::max(plan.target_w, plan.target_h) <= std::max(iw, ih) &&
		    std::min(plan.target_w, plan.target_h) <= std::min(iw, ih);

	bool ok = false;
	switch (plan.path) {
	case Load_Path::FULL_SIZE:
		ok = _load_full_size(sd, std::move(probe), source, plan);
		break;
	case Load_Path::RESAMPLED:
		ok = plan.ours ? _load_decoded_now(sd, map, plan) : _load_resampled(sd, source, plan);
		break;
	case Load_Path::ASYNC:
		ok = plan.ours ? _load_decoded_in_background(sd, source, plan) : _load_async(sd, source, plan);
		break;
	}
	if (!ok)
		return EINA_FALSE;

	sd->path = strdup(path);
	if (!sd->path) {
		IE_LOG_E("Cannot copy the path");
		_preload_release(sd);
		_processing_popup_del(sd);
		return EINA_FALSE;
	}
	sd->loaded = EINA_TRUE;
	evas_object_smart_changed(obj);
	evas_object_show(obj);
	return EINA_TRUE;
}

void *ie_image_data_get(Evas_Object *obj)
{
	IE_CHECK_NULL(obj);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK_NULL(sd);
	return evas_object_image_data_get(sd->image, EINA_TRUE);
}

void _own_pixels_release_unshown(Mainimg_Smart_Data *sd)
{
	if (!sd->own_pixels || (sd->image && evas_object_image_data_get(sd->image, EINA_FALSE) == sd->own_pixels))
		return;
	free(sd->own_pixels);
	sd->own_pixels = NULL;
}

/* The picture goes: Evas frees its own pixels or lets the file go, the
 * main image frees its earlier buffer unless it is `keep` (coming back
 * reworked). The field is cleared first, as Evas reports the image resized
 * from inside these calls. */
static void _picture_drop(Mainimg_Smart_Data *sd, const void *keep)
{
	Evas_Object *image = sd->image;
	void *earlier = sd->own_pixels;
	sd->own_pixels = NULL;
	const char *file = NULL;
	const Eina_File *mapped = NULL;
	evas_object_image_file_get(image, &file, NULL);
	evas_object_image_mmap_get(image, &mapped, NULL);
	if (file || mapped)
		evas_object_image_file_set(image, NULL, NULL);
	evas_object_image_data_set(image, NULL);
	if (earlier != keep)
		free(earlier);
}

/* Evas shows pixels given with evas_object_image_data_set as they are and
 * never frees them; putting a picture in Evas's own buffer instead costs a
 * copy into fresh pages, page faults included. */
Eina_Bool ie_image_pixels_take(Evas_Object *obj, void *pixels, int w, int h)
{
	/* Ours from here on, whatever happens. */
	std::unique_ptr<void, decltype(&free)> taken(pixels, free);
	IE_CHECK_VAL(obj, EINA_FALSE);
	IE_CHECK_VAL(pixels, EINA_FALSE);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK_VAL(sd, EINA_FALSE);

	_picture_drop(sd, pixels);
	Evas_Object *image = sd->image;
	evas_object_image_size_set(image, w, h);
	/* Evas reads the rows at its own stride, which it reports cut to 16
	 * bits: a picture 8192 or more pixels wide shows only the low half. */
	const int stride = evas_object_image_stride_get(image);
	if (w <= 0 || h <= 0 || (stride & 0xffff) != ((w * 4) & 0xffff)) {
		IE_LOG_E("Cannot show a %dx%d picture", w, h);
		return EINA_FALSE;
	}
	evas_object_image_data_set(image, pixels);
	evas_object_image_data_update_add(image, 0, 0, w, h);
	sd->own_pixels = taken.release();
	return EINA_TRUE;
}

void *ie_image_own_pixels_get(Evas_Object *obj, int w, int h)
{
	IE_CHECK_NULL(obj);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK_NULL(sd);
	int shown_w = 0, shown_h = 0;
	evas_object_image_size_get(sd->image, &shown_w, &shown_h);
	if (sd->own_pixels && shown_w == w && shown_h == h &&
	    evas_object_image_data_get(sd->image, EINA_FALSE) == sd->own_pixels)
		return sd->own_pixels;
	/* Every pixel is written anew: the old picture goes first, so that
	 * two of them are never held at once. */
	_picture_drop(sd, NULL);
	size_t bytes = 0;
	void *pixels = NULL;
	if (w > 0 && h > 0 && !__builtin_mul_overflow((size_t)w * (size_t)h, (size_t)4, &bytes))
		pixels = malloc(bytes);
	if (!pixels) {
		IE_LOG_E("Cannot hold a %dx%d picture", w, h);
		return NULL;
	}
	return ie_image_pixels_take(obj, pixels, w, h) ? pixels : NULL;
}

Eina_Bool ie_image_pixels_owned(Evas_Object *obj, const void *pixels)
{
	IE_CHECK_VAL(obj, EINA_FALSE);
	Mainimg_Smart_Data *sd = _mainimg_data_get(obj);
	IE_CHECK_VAL(sd, EINA_FALSE);
	return pixels && pixels == sd->own_pixels;
}
