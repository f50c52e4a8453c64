#include "framework/host/jpegsrc.h"

#include <jerror.h>

namespace {

void JumpBack(j_common_ptr cinfo) {
  // mgr is the first member of JpegErrorJump, so the error pointer is the whole record.
  JpegErrorJump* error = reinterpret_cast<JpegErrorJump*>(cinfo->err);
  longjmp(error->jump, 1);
}

// Detectors read frames from hostile cameras: a bad frame is an ordinary event, not
// something to write to the recorder's stderr.
void StayQuiet(j_common_ptr) {}

void InstallExit(JpegErrorJump* error) {
  jpeg_std_error(&error->mgr);
  error->mgr.error_exit = JumpBack;
  error->mgr.output_message = StayQuiet;
}

// The input ends at the caller's last byte; past it the reader sees EOI markers, as
// libjpeg's own sources do, so the parser ends instead of reading outside the frame.
const JOCTET kFakeEoi[2] = {0xFF, JPEG_EOI};

void InitSource(j_decompress_ptr) {}

boolean FillInputBuffer(j_decompress_ptr cinfo) {
  WARNMS(cinfo, JWRN_JPEG_EOF);
  cinfo->src->next_input_byte = kFakeEoi;
  cinfo->src->bytes_in_buffer = sizeof(kFakeEoi);
  return TRUE;
}

void SkipInputData(j_decompress_ptr cinfo, long num_bytes) {
  if (num_bytes <= 0) return;
  jpeg_source_mgr* src = cinfo->src;
  if (static_cast<unsigned long>(num_bytes) > src->bytes_in_buffer) {
    // Skipping past the end: what follows is the fake EOI.
    FillInputBuffer(cinfo);
    return;
  }
  src->next_input_byte += num_bytes;
  src->bytes_in_buffer -= static_cast<size_t>(num_bytes);
}

void TermSource(j_decompress_ptr) {}

}  // namespace

void SetJpegExit(j_decompress_ptr cinfo, JpegErrorJump* error) {
  InstallExit(error);
  cinfo->err = &error->mgr;
}

void SetJpegExit(j_compress_ptr cinfo, JpegErrorJump* error) {
  InstallExit(error);
  cinfo->err = &error->mgr;
}

void JpegMemSrc(j_decompress_ptr cinfo, const unsigned char* data, unsigned long length) {
  if (data == nullptr || length == 0) ERREXIT(cinfo, JERR_INPUT_EMPTY);

  // A source left by an earlier JpegMemSrc on this object is reused; another kind of
  // source is replaced (its memory stays in the pool until the object is destroyed).
  if (cinfo->src == nullptr || cinfo->src->init_source != InitSource) {
    cinfo->src = static_cast<jpeg_source_mgr*>(
        (*cinfo->mem->alloc_small)(reinterpret_cast<j_common_ptr>(cinfo), JPOOL_PERMANENT,
                                   sizeof(jpeg_source_mgr)));
  }
  jpeg_source_mgr* src = cinfo->src;
  src->init_source = InitSource;
  src->fill_input_buffer = FillInputBuffer;
  src->skip_input_data = SkipInputData;
  src->resync_to_restart = jpeg_resync_to_restart;
  src->term_source = TermSource;
  src->next_input_byte = data;
  src->bytes_in_buffer = length;
}
