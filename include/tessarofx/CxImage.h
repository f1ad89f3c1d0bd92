// The library's own raster and the colour records the CPU effects share.
//
// A CxImage is either owning (it allocated `bits` with array new and frees it) or wrapping (it
// borrows a caller's buffer, typically the destination frame of an effect, and never frees it).
// Rows run top-down, `effWidth` bytes apart. The field order and the virtual destructor are part
// of the binary interface a host sees and must stay as they are.
//
// One CxImage is used by one thread at a time; a wrapping image shares the caller's buffer
// without any synchronisation.
#pragma once

#include <cstdint>

#include "tessarofx/Export.h"

// Byte order of one pixel in memory.
enum _ImagePixelFormat : int {
  IPF_Gray8 = 0,  // one byte, grey
  IPF_RGB = 1,    // 3 bytes R,G,B; or a 16-bit word with blue in the low 5 bits
  IPF_BGR = 2,    // 3 bytes B,G,R; or a 16-bit word with red in the low 5 bits
  IPF_RGBA = 3,   // 4 bytes R,G,B,A
  IPF_BGRA = 4,   // 4 bytes B,G,R,A: the format of every effect's frame
  IPF_None = 5,   // empty image, no valid pixels
};

// One 8-bit colour. Passed by value as one 32-bit word: blue in bits 0-7, green 8-15, red 16-23,
// alpha (`rgbReserved`) 24-31. RGBtoHSL reuses it for an integer HSL colour: hue in the red
// byte, saturation in the green byte, lightness in the blue byte, each 0..255.
struct tagRGBQUAD {
  uint8_t rgbBlue;
  uint8_t rgbGreen;
  uint8_t rgbRed;
  uint8_t rgbReserved;
};
static_assert(sizeof(tagRGBQUAD) == 4, "tagRGBQUAD travels as one 32-bit word");

// Float colours, each channel nominally 0..1.
struct _rgb {
  float r;
  float g;
  float b;
};

struct _rgba {
  float r;
  float g;
  float b;
  float a;
};

// Hue in degrees 0..360, saturation and lightness 0..1.
struct _hsl {
  float h;
  float s;
  float l;
};

// The argument limited to 0..255.
TFX_API uint8_t ClampToByte(int value);

class TFX_API CxImage {
 public:
  // Empty image: no buffer, all sizes 0, format IPF_None, ready to own what Create allocates.
  CxImage();
  // Owning image; see Create.
  CxImage(unsigned int width, unsigned int height, unsigned int bpp, _ImagePixelFormat format);
  // Wraps the caller's buffer *ppBits without allocating or copying. `ppBits` is kept so that
  // Copy can clear the caller's pointer when it replaces the buffer. An 8-bit image is always
  // IPF_Gray8.
  CxImage(unsigned char** ppBits, unsigned int width, unsigned int height, unsigned int bpp,
          unsigned int effWidth, _ImagePixelFormat format);
  virtual ~CxImage();

  // Copying the object would duplicate buffer ownership; Copy() copies pixels instead.
  CxImage(const CxImage&) = delete;
  CxImage& operator=(const CxImage&) = delete;

  // Re-shapes the image. An owning image frees its buffer and allocates an uninitialised one of
  // GetSize() bytes; a wrapping image keeps its buffer and only changes the header. Rows are
  // padded to a multiple of 4 bytes. Returns this, or null (leaving the image empty) when an
  // argument is 0, a row or the whole buffer needs more bytes than the 32-bit fields hold, the
  // allocation fails, or a wrapping image would need more than the GetSize() it had.
  CxImage* Create(unsigned int width, unsigned int height, unsigned int bpp,
                  _ImagePixelFormat format);
  // Frees an owned buffer and empties the header; a wrapped buffer is left untouched.
  void Destroy();

  uint32_t GetSize() const { return size; }
  uint8_t* GetBits() const { return bits; }
  uint32_t GetWidth() const { return width; }
  uint32_t GetHeight() const { return height; }
  uint32_t GetEffWidth() const { return effWidth; }
  uint32_t GetBpp() const { return bpp; }
  _ImagePixelFormat getFormat() const { return format; }

  // Reads one pixel in this image's byte order. Out-of-range coordinates, a pixel whose bytes would
  // end past GetSize() (a header whose stride or size does not cover its rows), a missing buffer
  // and unsupported format/size combinations read as the all-zero quad. A grey pixel is returned
  // in all four bytes, alpha included, whatever `bGetAlpha` says.
  tagRGBQUAD GetPixelColor(unsigned long x, unsigned long y, bool bGetAlpha = true) const;
  // Writes one pixel; ignored where GetPixelColor would read zero. A grey image stores the red
  // byte; 4-byte formats always store alpha.
  void SetPixelColor(unsigned long x, unsigned long y, tagRGBQUAD c);

  // Takes the source's header and pixels. When this image holds a buffer of other dimensions, or
  // one smaller than the source's GetSize(), that buffer is deleted first, even a wrapped one (the
  // caller's pointer is then cleared).
  // The ownership flag is copied from the source as well.
  void Copy(const CxImage* src);
  // As above, but only when the source has pixels, and keeping this image's ownership flag.
  void Copy(const CxImage& src);

  // Re-creates the given planes as 8-bit grey images of this size and fills them with the red,
  // green, blue and alpha bytes (SplitHSLA: hue, saturation, lightness and alpha). `a` may be
  // null. False when this image has no buffer, no plane is given, the image is grey or empty, or
  // its header is inconsistent (bpp other than 8, 16, 24, 32, a stride shorter than a row, or a
  // size other than stride * height).
  bool SplitRGBA(CxImage* r, CxImage* g, CxImage* b, CxImage* a);
  bool SplitHSLA(CxImage* r, CxImage* g, CxImage* b, CxImage* a);
  // Rebuilds this image, keeping its bpp and format, from three or four equally sized 8-bit
  // planes; colorspace 1 reads them as H, S, L. Without `a`, alpha is whatever the re-created
  // buffer held. Mismatched planes abort the process. False when a plane is missing or this
  // image cannot be re-created at the planes' non-zero size (see Create).
  bool Combine(CxImage* r, CxImage* g, CxImage* b, CxImage* a, int colorspace);

  // Integer HSL on a 0..255 scale. A grey has hue 170; a negative hue wraps modulo 256.
  static tagRGBQUAD RGBtoHSL(tagRGBQUAD c);
  static tagRGBQUAD HSLtoRGB(tagRGBQUAD hsl);
  // One channel of HSLtoRGB for a hue in degrees, wrapped once into 0..360.
  static float HueToRGB(float p, float q, float hue);

 protected:
  uint8_t* bits;
  uint8_t** externalBits;  // the wrapping caller's pointer variable; null when owning
  uint32_t ownsBits;
  uint32_t width;
  uint32_t height;
  uint32_t bpp;
  uint32_t bytesPerPixel;  // 1, 2, 3, 4 for bpp 8, 16, 24, 32; 0 for anything else
  uint32_t effWidth;       // bytes per row
  uint32_t size;           // effWidth * height
  _ImagePixelFormat format;
};
