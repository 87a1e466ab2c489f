/* Pixel operations for photo restoration: plain C functions over raw buffers.
 *
 * 32-bit images hold 4 bytes a pixel, alpha first (byte 0 alpha, then red,
 * green, blue); "ARGB" and "AlphaFirst" in the names mean the same layout.
 * 8-bit masks and single channels hold 1 byte a sample; the blur family also
 * takes a step in bytes between neighbouring samples, so it can run on one
 * channel of an interleaved image. Every buffer has its own row length in
 * bytes, so rows may be padded.
 *
 * The functions keep no state: any thread may call them, on disjoint buffers
 * or on the same read-only source. Zero width or height returns at once.
 * Pointers must cover width x height samples at the given steps and row
 * lengths; they are not checked. Where a function says "in place", source and
 * destination may be the same buffer; otherwise they must not overlap.
 * The results are exact: every output byte is defined by integer or
 * table-driven arithmetic and does not depend on the CPU or the code path.
 */
#ifndef KXACORE_IMAGING_IPLPIXELOPERATIONS_H
#define KXACORE_IMAGING_IPLPIXELOPERATIONS_H

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* gAlphaLookUpTable[a * 256 + c] = floor(a * c / 255): scaling by alpha,
 * truncating. Row 255 is the identity, row 0 all zero. */
extern const uint8_t gAlphaLookUpTable[256 * 256];

/* Weights in percent by tenths of the squared relative distance from a
 * disc's centre (11 used entries, then 0). */
extern const int _squaredProximityDropoffProfile[12];

/* A symmetric hump per 8-bit level: 0 at levels 0 and 255, 0.33 at 127 and
 * 128, through 0.117 (32), 0.217 (64), 0.297 (96), 0.295 (160), 0.214 (192)
 * and 0.113 (224). Between those samples it is the monotone piecewise cubic
 * (PCHIP, weighted harmonic-mean slopes) through them, rounded to 5 places. */
extern const float _maxGenericOneHumpLUT[256];

/* The S-shaped contrast curve of the tone tool: -0.148 * sin(2 pi i / 255),
 * rounded to 5 places; negative in the shadows, positive in the highlights,
 * -0.117 at level 37 and 0.117 at level 218, where the tone limits bite. */
extern const float _maxGenericOgeeLUT[256];

/* The blurs write nothing for larger radii: their tables and padding grow
 * with the radius (the repeated 3-tap blur costs radius passes per line).
 * Erosion and dilation take any radius. */
#define IPLMaximumBlurRadius ((size_t)65535)

/* Selectors of IPLBlur. */
enum {
  IPLMorphologyErode = 0,
  IPLMorphologyDilate = 1,
  IPLMorphologyNone = 2,
  IPLBlurBox = 0,
  IPLBlurGaussian = 1,
  IPLBlurNone = 2
};

/* Box blur of one 8-bit channel: the rounded mean over a (2r+1) x (2r+1)
 * window, rows first, then columns. Borders mirror with the edge sample
 * repeated, and keep mirroring for radii larger than the image. In place. */
void IPLBoxBlur(const uint8_t *source, uint8_t *destination, size_t width,
                size_t height, size_t sourceStep, size_t destinationStep,
                size_t sourceRowBytes, size_t destinationRowBytes,
                size_t radius);

/* Repeated 3-tap blur: radius passes of the rounded mean of 3 neighbours
 * along rows, then along columns; borders as IPLBoxBlur. In place. */
void IPLGaussianBlur(const uint8_t *source, uint8_t *destination, size_t width,
                     size_t height, size_t sourceStep, size_t destinationStep,
                     size_t sourceRowBytes, size_t destinationRowBytes,
                     size_t radius);

/* Minimum / maximum over a (2r+1) x (2r+1) window, with zero outside the
 * image: erosion darkens everything within r samples of an edge. In place. */
void IPLErode(const uint8_t *source, uint8_t *destination, size_t width,
              size_t height, size_t sourceStep, size_t destinationStep,
              size_t sourceRowBytes, size_t destinationRowBytes,
              size_t radius);
void IPLDilate(const uint8_t *source, uint8_t *destination, size_t width,
               size_t height, size_t sourceStep, size_t destinationStep,
               size_t sourceRowBytes, size_t destinationRowBytes,
               size_t radius);

/* Optional erosion (0) or dilation (1), then optional box (0) or repeated
 * 3-tap (1) blur of the result; any other selector skips that step. The
 * blur reads the destination when a morphology ran. With a blur selected and
 * a radius above IPLMaximumBlurRadius nothing is written. In place. */
void IPLBlur(const uint8_t *source, uint8_t *destination, size_t width,
             size_t height, size_t sourceStep, size_t destinationStep,
             size_t sourceRowBytes, size_t destinationRowBytes, size_t radius,
             int morphology, int blur);

/* The four filters above on every byte of 32-bit alpha-first pixels (alpha
 * included) in one pass over the interleaved image: the same bytes as four
 * calls of the 8-bit filter with step 4, one per byte of the pixel, at a
 * fraction of the cost. Row lengths are in bytes (at least 4 x width).
 * In place. */
void IPLBoxBlur32BitAlphaFirstImage(const uint8_t *source, uint8_t *destination,
                                    size_t width, size_t height,
                                    size_t sourceRowBytes,
                                    size_t destinationRowBytes, size_t radius);
void IPLGaussianBlur32BitAlphaFirstImage(const uint8_t *source,
                                         uint8_t *destination, size_t width,
                                         size_t height, size_t sourceRowBytes,
                                         size_t destinationRowBytes,
                                         size_t radius);
void IPLErode32BitAlphaFirstImage(const uint8_t *source, uint8_t *destination,
                                  size_t width, size_t height,
                                  size_t sourceRowBytes,
                                  size_t destinationRowBytes, size_t radius);
void IPLDilate32BitAlphaFirstImage(const uint8_t *source, uint8_t *destination,
                                   size_t width, size_t height,
                                   size_t sourceRowBytes,
                                   size_t destinationRowBytes, size_t radius);

/* Working forms of the blur family: lineBuffer holds at least
 * max(width, height) + 2 * radius + 1 bytes; divisionTable (blurs only) has
 * (2k + 1) * 255 + 1 entries, entry s = (s + k) / (2k + 1), with k the radius
 * for the box blur and 1 for the 3-tap blur. */
void _IPLBoxBlur(const uint8_t *source, uint8_t *destination, size_t width,
                 size_t height, size_t sourceStep, size_t destinationStep,
                 size_t sourceRowBytes, size_t destinationRowBytes,
                 size_t radius, uint8_t *lineBuffer,
                 const uint8_t *divisionTable);
void _IPLGaussianBlur(const uint8_t *source, uint8_t *destination,
                      size_t width, size_t height, size_t sourceStep,
                      size_t destinationStep, size_t sourceRowBytes,
                      size_t destinationRowBytes, size_t radius,
                      uint8_t *lineBuffer, const uint8_t *divisionTable);
void _IPLErode(const uint8_t *source, uint8_t *destination, size_t width,
               size_t height, size_t sourceStep, size_t destinationStep,
               size_t sourceRowBytes, size_t destinationRowBytes,
               size_t radius, uint8_t *lineBuffer);
void _IPLDilate(const uint8_t *source, uint8_t *destination, size_t width,
                size_t height, size_t sourceStep, size_t destinationStep,
                size_t sourceRowBytes, size_t destinationRowBytes,
                size_t radius, uint8_t *lineBuffer);

/* Sets the alpha (and optionally scales the colours) of a 32-bit image by an
 * 8-bit mask. Flags: useImageAlpha scales the image's alpha instead of
 * replacing it; scaleColors scales the colours; invert uses 255 - mask,
 * except that with useImageAlpha clear and scaleColors set the alpha still
 * takes the plain mask. Colour bytes not scaled are left as the destination
 * holds them. In place. */
void IPLApply8BitMaskTo32BitAlphaFirstImage(
    const uint8_t *image, const uint8_t *mask, uint8_t *destination,
    size_t width, size_t height, size_t imageRowBytes, size_t maskStep,
    size_t maskRowBytes, size_t destinationRowBytes, int useImageAlpha,
    int scaleColors, int invert);

/* destination = scale(A', B'), A' = A or 255 - A, likewise B, then
 * 255 - result when invertResult. In place on either mask. */
void IPLCombine8BitMasks(const uint8_t *maskA, const uint8_t *maskB,
                         uint8_t *destination, size_t width, size_t height,
                         size_t maskARowBytes, size_t maskBRowBytes,
                         size_t destinationRowBytes, int invertA, int invertB,
                         int invertResult);

/* Thresholds a mask to 0 / 255: without fullLevel any non-zero sample
 * counts, with it only 255 does (see the table in the implementation). */
void IPLCeil8BitMask(const uint8_t *source, uint8_t *destination, size_t width,
                     size_t height, size_t sourceRowBytes,
                     size_t destinationRowBytes, int fullLevel, int invert);

/* Undoes premultiplied alpha: c = (c * 255) / a, truncated, low 8 bits kept
 * (a colour larger than its alpha wraps); alpha 0 keeps the colours. */
void IPLDemultiplyAlphaFrom32BitAlphaFirstImage(const uint8_t *source,
                                                uint8_t *destination,
                                                size_t width, size_t height,
                                                size_t sourceRowBytes,
                                                size_t destinationRowBytes);

/* c = (a - background + c) mod 256 for each colour, alpha copied. */
void IPLRemoveBackgroundColorFrom32BitAlphaFirstImage(
    const uint8_t *source, uint8_t *destination, size_t width, size_t height,
    size_t sourceRowBytes, size_t destinationRowBytes, uint8_t red,
    uint8_t green, uint8_t blue);

/* Shifts colours along a hue angle (whole degrees) by amount, weighted by
 * the hump (or 0.5 everywhere with constantWeight). Alpha copied. In place. */
void IPLApplyCustomLUTTo32BitARGBImage(const uint8_t *source,
                                       uint8_t *destination, size_t width,
                                       size_t height, size_t sourceRowBytes,
                                       size_t destinationRowBytes, int angle,
                                       int constantWeight, float amount);

/* The brightness / contrast pair a tone call actually applies. */
typedef struct IPLToneAmounts {
  float brightness;
  float contrast;
} IPLToneAmounts;

/* Tone curve from brightness and contrast, the same on red, green and blue;
 * the pair is first limited so that the curve does not clip too hard, and
 * the limited pair is returned. With alternativeCurve the limits are skipped
 * and the curve is y = x + 0.5 b + c m(x), with m(x) = 4x - 2 from x = 0.5
 * up and 0.8x - 0.4 below, clamped to [0, 1]: contrast opens the highlights
 * steeply and the shadows gently. In place. */
IPLToneAmounts IPLApplyToneLUTTo32BitARGBImage(
    const uint8_t *source, uint8_t *destination, size_t width, size_t height,
    size_t sourceRowBytes, size_t destinationRowBytes, int alternativeCurve,
    float brightness, float contrast);

/* Moves colours toward white by amount / 255. sourcePremultiplied says the
 * source colours are premultiplied; premultiply premultiplies the result.
 * Amount 0 does nothing unless exactly one flag is set (see the
 * implementation's table). Alpha copied. In place. */
void IPLApplyTintTo32BitAlphaFirstImage(const uint8_t *source,
                                        uint8_t *destination, size_t width,
                                        size_t height, size_t sourceRowBytes,
                                        size_t destinationRowBytes,
                                        int sourcePremultiplied,
                                        int premultiply, uint8_t amount);

/* Sets every alpha to `alpha`; demultiply first undoes premultiplied
 * source colours; premultiply (only when alpha < 255) scales the colours by
 * the new alpha. With neither, colour bytes are not written. In place. */
void IPLClearAlphaChannelOf32BitAlphaFirstImage(
    const uint8_t *source, uint8_t *destination, size_t width, size_t height,
    size_t sourceRowBytes, size_t destinationRowBytes, uint8_t alpha,
    int demultiply, int premultiply);

/* Whitens yellowish pixels in the disc inscribed in a square of side
 * sideLength, blending 10 % of the result into the destination, which must
 * already hold an image (it may be the source). Outside the disc nothing is
 * written. */
void IPLTeethWhitenerFrom32BitARGBImage(const uint8_t *source,
                                        uint8_t *destination,
                                        size_t sideLength,
                                        size_t sourceRowBytes,
                                        size_t destinationRowBytes);

/* Pulls colours toward their grey in the disc of a square, most at the
 * centre. Mode 1 acts on reddish casts only. A 1 x 1 square is its own
 * centre (full weight). Outside the disc nothing is written. In place. */
void IPLRemoveEncircledChromaFrom32BitARGBImage(const uint8_t *source,
                                                uint8_t *destination,
                                                size_t sideLength,
                                                size_t sourceRowBytes,
                                                size_t destinationRowBytes,
                                                int mode);

/* RGB (0-255 doubles, red first) to HSV (hue degrees [0, 360), saturation
 * and value [0, 1]) and back; the way back rounds to whole levels. Null
 * pointers make them do nothing. */
void IPLHueSaturatuinValueFromRGB(double *hsv, const double *rgb);
void IPLRGBFromHueSaturatuinValue(double *rgb, const double *hsv);

#ifdef __cplusplus
}
#endif

#endif
