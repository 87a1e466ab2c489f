/* Compiled as C: the pixel header must stay valid C and link from C. */
#include "kxacore/Imaging/IPLPixelOperations.h"

int kxaImagingCallFromC(void);

int kxaImagingCallFromC(void) {
  uint8_t mask[4] = {0, 1, 254, 255};
  uint8_t thresholded[4];
  double rgb[3] = {255.0, 255.0, 0.0};
  double hsv[3];
  IPLCeil8BitMask(mask, thresholded, 4, 1, 4, 4, 1, 1);
  IPLHueSaturatuinValueFromRGB(hsv, rgb);
  return thresholded[2] == 0 && thresholded[3] == 255 && hsv[0] == 60.0 &&
         gAlphaLookUpTable[255 * 256 + 7] == 7;
}
