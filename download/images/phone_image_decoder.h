// Fills images from text files and writes them back.
#ifndef KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_DECODER_H
#define KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_DECODER_H

#include "download/images/phone_image.h"
#include "download/images/text_source.h"

namespace kral::images {

class PhoneImageDecoder {
 public:
  virtual ~PhoneImageDecoder() = default;

  // Both report failure, an image exception included, by their result only. A failed Decode leaves in the image what
  // came before the failing record.
  virtual bool Decode(PhoneImage& image, TextSource& file) = 0;
  virtual bool Encode(PhoneImage& image, TextSink& file) = 0;
};

}  // namespace kral::images

#endif
