#include "PhotoEditorEngine.h"
#include "engine-effects.h"

namespace {

bool rgb_record_usable(const IEL_Image *image)
{
	return image && image->pbBuf && image->eFormat == IEL_FORMAT_RGB888;
}

/* The option value picks the weight of the cartoon's outlines and of the
 * sketch's pencil: 1 light, 2 medium (the editor's choice), 3 strong. No
 * option means medium. */
bool read_weight(const int32_t *option, pee::Weight *weight)
{
	int32_t value = option ? *option : pee::WEIGHT_MEDIUM;
	if (value < pee::WEIGHT_LIGHT || value > pee::WEIGHT_STRONG)
		return false;
	*weight = pee::Weight(value);
	return true;
}

} // namespace

/* Ids: 2 magic pen, 3 sketch (needs the texture: format 3, the picture's
 * size), 4 cartoon, 6 oil paint. Input and output are RGB888 records of
 * the same size. Results: 0 done; IEL_ERR_INVALID_PARAM for a missing
 * record, buffer or texture, an unknown id or an option outside 1..3;
 * IEL_ERR_INVALID_SIZE for an empty, oversized or mismatched picture;
 * IEL_ERR_UNSUPPORTED_FORMAT for other pixel formats; IEL_ERR_NO_MEMORY. */
int IEL_Apply_Effect(const IEL_Image *input, IEL_Image *output, const IEL_EffectParam *param)
{
	if (!input || !output || !param || !input->pbBuf || !output->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	if (!rgb_record_usable(input) || !rgb_record_usable(output))
		return IEL_ERR_UNSUPPORTED_FORMAT;
	if (!kit::size_usable(input->u32Width, input->u32Height) || output->u32Width != input->u32Width ||
	    output->u32Height != input->u32Height)
		return IEL_ERR_INVALID_SIZE;
	const int width = int(input->u32Width), height = int(input->u32Height);
	pee::Weight weight = pee::WEIGHT_MEDIUM;
	int result = IEL_ERR_INVALID_PARAM;
	switch (param->u16EffectId) {
	case IEL_EFFECT_ID_MAGIC_PEN:
		result = pee::magic_pen(input->pbBuf, output->pbBuf, width, height);
		break;
	case IEL_EFFECT_ID_CARTOON:
		if (!read_weight(param->ps32Option, &weight))
			return IEL_ERR_INVALID_PARAM;
		result = pee::cartoon(input->pbBuf, output->pbBuf, width, height, weight);
		break;
	case IEL_EFFECT_ID_OIL_PAINT:
		result = pee::oil_paint(input->pbBuf, output->pbBuf, width, height);
		break;
	case IEL_EFFECT_ID_SKETCH: {
		const IEL_Image *texture = param->pstTexture;
		if (!texture || !texture->pbBuf || !read_weight(param->ps32Option, &weight))
			return IEL_ERR_INVALID_PARAM;
		if (texture->eFormat != IEL_FORMAT_BGRA8888)
			return IEL_ERR_UNSUPPORTED_FORMAT;
		if (texture->u32Width != input->u32Width || texture->u32Height != input->u32Height)
			return IEL_ERR_INVALID_SIZE;
		result = pee::sketch(input->pbBuf, texture->pbBuf, output->pbBuf, width, height, weight);
		break;
	}
	default:
		return IEL_ERR_INVALID_PARAM;
	}
	return result == kit::RESULT_NO_MEMORY ? IEL_ERR_NO_MEMORY : result;
}
