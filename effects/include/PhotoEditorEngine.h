/* Artistic effects on RGB888 pictures (IEL_FORMAT_RGB888 records).
 * IEL_Apply_Effect reads the input record's pixels (and the texture where
 * the effect takes one) and fills the output record's buffer, which has the
 * input's size. It returns 0 on success, non-zero otherwise. */
#ifndef PHOTOEDITORENGINE_H
#define PHOTOEDITORENGINE_H

#include "IEL_Types.h"

#ifdef __cplusplus
extern "C" {
#endif

enum {
	IEL_EFFECT_ID_MAGIC_PEN = 2,
	IEL_EFFECT_ID_SKETCH = 3,
	IEL_EFFECT_ID_CARTOON = 4,
	IEL_EFFECT_ID_OIL_PAINT = 6
};

__attribute__((visibility("default")))
int IEL_Apply_Effect(const IEL_Image *input, IEL_Image *output, const IEL_EffectParam *param);

#ifdef __cplusplus
}
#endif

#endif
