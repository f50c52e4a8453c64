#include "host/jpeg/dcluma.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <new>
#include <vector>

namespace {

// The decoding loop's helpers are forced inline, so that the bit reader's state stays in
// registers through the loop instead of going through memory at every call.
#define DCLUMA_INLINE __attribute__((always_inline)) inline

// Bits looked at at once by an AC table: runs of whole symbols (codes with their value
// bits) up to this long are skipped in one step.
constexpr int kStepBits = 14;
constexpr size_t kSteps = size_t{1} << kStepBits;
// Codes up to this long are found with one look-up; longer ones as libjpeg finds them.
constexpr int kCodeBits = 9;
constexpr int kMaxCodeLength = 16;
constexpr int kMaxBlocksInMcu = 10;  // the format's limit (D_MAX_BLOCKS_IN_MCU)
constexpr int kFillBits = 3 * kStepBits;  // three steps between fills
static_assert(kFillBits <= 57, "a fill tops the buffer up by whole bytes");
constexpr int kNever = 127;          // a step's room that no block position has

// How far an AC symbol moves along the block: 0 for the end of block, 16 for a run of
// sixteen zeros, else its run of zeros and its own coefficient.
int Advance(int symbol) {
  const int run = symbol >> 4, value_bits = symbol & 15;
  return value_bits != 0 ? run + 1 : (run == 15 ? 16 : 0);
}

// A frame's Huffman table, as its DHT segment gave it.
struct HuffSource {
  std::array<uint8_t, 17> bits;
  std::array<uint8_t, 256> val;
  bool set = false;

  bool Equals(const JHUFF_TBL& t) const {
    return set && std::memcmp(bits.data(), t.bits, 17) == 0 &&
           std::memcmp(val.data(), t.huffval, 256) == 0;
  }
  void Assign(const JHUFF_TBL& t) {
    std::memcpy(bits.data(), t.bits, 17);
    std::memcpy(val.data(), t.huffval, 256);
    set = true;
  }
};

// A Huffman table made ready for decoding, and for an AC table, for skipping.
struct HuffTable {
  // (length << 8) | symbol of the code at the front of the next kCodeBits bits; 0 when
  // the code is longer.
  std::array<uint16_t, 1 << kCodeBits> code;
  // Longer codes, as libjpeg decodes them: the largest code of each length (-1 when none)
  // and the offset from a code to its symbol's index.
  std::array<int32_t, kMaxCodeLength + 1> maxcode;
  std::array<int32_t, kMaxCodeLength + 1> valoffset;
  std::array<uint8_t, 256> huffval;
  // AC tables: step[] is indexed by the next kStepBits bits and says what they hold:
  //   bits 0-3   bits taken by the whole symbols at the front; 0 when none fits
  //   bits 4-10  the room they need: how far they move along the block, plus one when
  //              the last is the end of block (kNever when none fits); they apply at
  //              block position k when k + room <= 64
  //   bit 11     the last of them is the end of block
  std::unique_ptr<uint16_t[]> step;
  HuffSource made_from;  // unset while nothing usable is made

  // False for a table libjpeg refuses (JERR_BAD_HUFF_TABLE: more than 256 symbols, codes
  // that do not fit their length, DC symbols over 15) or when memory runs out.
  bool Make(const JHUFF_TBL& t, bool is_dc);

 private:
  void MakeSteps(const std::vector<uint16_t>& front);
};

bool HuffTable::Make(const JHUFF_TBL& t, bool is_dc) {
  made_from.set = false;
  std::array<uint8_t, 257> size{};
  std::array<uint32_t, 257> codes{};
  int count = 0;
  for (int l = 1; l <= kMaxCodeLength; ++l) {
    if (count + t.bits[l] > 256) return false;
    for (int i = 0; i < t.bits[l]; ++i) size[count++] = static_cast<uint8_t>(l);
  }
  uint32_t next = 0;
  int length = size[0];
  for (int p = 0; size[p] != 0;) {
    while (size[p] == length) codes[p++] = next++;
    if (next >= (1u << length)) return false;
    next <<= 1;
    ++length;
  }
  for (int p = 0, l = 1; l <= kMaxCodeLength; ++l) {
    if (t.bits[l] != 0) {
      valoffset[l] = p - static_cast<int32_t>(codes[p]);
      p += t.bits[l];
      maxcode[l] = static_cast<int32_t>(codes[p - 1]);
    } else {
      maxcode[l] = -1;
    }
  }
  for (int p = 0; p < count; ++p) {
    if (is_dc && t.huffval[p] > 15) return false;
    huffval[p] = t.huffval[p];
  }

  // The code at the front of every bit string of the look-up's length, (length << 8) |
  // symbol, 0 for none.
  const int look = is_dc ? kCodeBits : kStepBits;
  std::vector<uint16_t> front;
  try {
    front.assign(size_t{1} << look, 0);
    if (!is_dc && step == nullptr) step.reset(new uint16_t[kSteps]);
  } catch (const std::bad_alloc&) {
    return false;
  }
  for (int p = 0; p < count && size[p] <= look; ++p) {
    const uint32_t first = codes[p] << (look - size[p]);
    const uint32_t span = 1u << (look - size[p]);
    for (uint32_t i = 0; i < span; ++i) {
      front[first + i] = static_cast<uint16_t>(size[p] << 8 | t.huffval[p]);
    }
  }
  for (uint32_t i = 0; i < code.size(); ++i) {
    const uint16_t f = front[i << (look - kCodeBits)];
    code[i] = (f >> 8) <= kCodeBits ? f : 0;
  }
  if (!is_dc) MakeSteps(front);
  made_from.Assign(t);
  return true;
}

void HuffTable::MakeSteps(const std::vector<uint16_t>& front) {
  for (uint32_t i = 0; i < kSteps; ++i) {
    int used = 0, moved = 0;
    bool end = false;
    while (!end && used < kStepBits) {
      // The bits after `used`, with zeros shifted in that a code must not reach.
      const uint16_t f = front[(i << used) & (kSteps - 1)];
      const int len = f >> 8, symbol = f & 0xFF;
      const int bits = len + (symbol & 15);
      if (len == 0 || used + bits > kStepBits) break;
      const int move = Advance(symbol);
      if (moved + move > DCTSIZE2) break;
      used += bits;
      moved += move;
      end = move == 0;
    }
    const int room = used == 0 ? kNever : moved + (end ? 1 : 0);
    step[i] = static_cast<uint16_t>(used | room << 4 | static_cast<int>(end) << 11);
  }
}

// The entropy-coded bits of a scan, most significant first, with the 0xFF 0x00 stuffing
// taken out. It stops at a marker (or the end of the data) and goes on with zero bits,
// counting them, so that a decoder that used them can be told it ran past its data.
class BitReader {
 public:
  BitReader(const uint8_t* p, const uint8_t* end) : p_(p), end_(end) {}

  // At least kFillBits bits in the buffer afterwards.
  DCLUMA_INLINE void Fill() {
    while (count_ < kFillBits) {
      if (end_ - p_ < 8 || stopped_) {
        // On a copy: were this object's address to escape, its state would live in memory.
        BitReader copy = *this;
        copy.FillBytes();
        *this = copy;
        return;
      }
      // The bytes before the first 0xFF, as many as fit, at once.
      const uint64_t w = Load(p_);
      const int bytes = std::min((64 - count_) >> 3, BytesBeforeFF(w));
      if (bytes > 0) {
        Take(w, bytes);
        continue;
      }
      if ((w >> 48 & 0xFF) != 0) {  // a marker: FillBytes() stops there
        BitReader copy = *this;
        copy.FillBytes();
        *this = copy;
        return;
      }
      buf_ |= 0xFFull << (56 - count_);  // 0xFF 0x00 is a data byte 0xFF
      count_ += 8;
      p_ += 2;
    }
  }
  // The next n bits, 1 <= n <= 32, without taking them.
  DCLUMA_INLINE uint32_t Peek(int n) const { return static_cast<uint32_t>(buf_ >> (64 - n)); }
  DCLUMA_INLINE void Skip(int n) {
    buf_ <<= n;
    count_ -= n;
  }
  // Whether bits after the end of the data were taken.
  bool Overran() const { return count_ < padded_; }
  // Data bits read ahead and not yet taken.
  int Unused() const { return count_ - padded_; }
  // The next byte not read: a marker's first 0xFF once reading stopped there.
  const uint8_t* Position() const { return p_; }

  // Starts again after the marker at Position(), which the caller has checked and is
  // `length` bytes long, dropping what is left of the current byte.
  void Restart(int length) {
    p_ += length;
    buf_ = 0;
    count_ = padded_ = 0;
    stopped_ = false;
  }

 private:
  __attribute__((noinline)) void FillBytes();
  // The eight bytes at p, the first one most significant.
  DCLUMA_INLINE static uint64_t Load(const uint8_t* p) {
    uint64_t w;
    std::memcpy(&w, p, 8);
    return __builtin_bswap64(w);
  }
  // How many of w's bytes, from the first, come before its first 0xFF (8 when none is).
  DCLUMA_INLINE static int BytesBeforeFF(uint64_t w) {
    const uint64_t inverted = ~w;  // 0xFF bytes become zero bytes
    const uint64_t low7 = 0x7F7F7F7F7F7F7F7Full;
    const uint64_t zero = ~(((inverted & low7) + low7) | inverted | low7);  // 0x80 per zero
    return zero == 0 ? 8 : __builtin_clzll(zero) >> 3;
  }
  // Appends the first `bytes` (1..8, fitting) bytes of w, none of them 0xFF.
  DCLUMA_INLINE void Take(uint64_t w, int bytes) {
    buf_ |= (w & (~0ull << (64 - 8 * bytes))) >> count_;
    p_ += bytes;
    count_ += 8 * bytes;
  }

  const uint8_t* p_;
  const uint8_t* end_;
  uint64_t buf_ = 0;  // the next count_ bits, at the top
  int count_ = 0;
  int padded_ = 0;  // zero bits added after the data stopped
  bool stopped_ = false;
};

// Byte by byte: Fill() comes here only near the end of the data or at a marker.
void BitReader::FillBytes() {
  while (count_ <= 56) {
    uint64_t byte = 0;
    if (stopped_ || p_ >= end_) {
      stopped_ = true;
      padded_ += 8;
    } else if (*p_ != 0xFF) {
      byte = *p_++;
    } else if (end_ - p_ >= 2 && p_[1] == 0) {
      byte = 0xFF;
      p_ += 2;
    } else {
      stopped_ = true;  // a marker; Position() stays at its 0xFF
      padded_ += 8;
    }
    buf_ |= byte << (56 - count_);
    count_ += 8;
  }
}

// Decodes one symbol with `table`, the buffer filled. -1 for a code not in the table.
DCLUMA_INLINE int DecodeSymbol(BitReader& bits, const HuffTable& table) {
  const uint16_t front = table.code[bits.Peek(kCodeBits)];
  if (front != 0) {
    bits.Skip(front >> 8);
    return front & 0xFF;
  }
  int l = kCodeBits + 1;
  int32_t code = static_cast<int32_t>(bits.Peek(l));
  while (code > table.maxcode[l]) {
    if (++l > kMaxCodeLength) return -1;
    code = static_cast<int32_t>(bits.Peek(l));
  }
  bits.Skip(l);
  const int index = table.valoffset[l] + code;
  return index >= 0 && index < 256 ? table.huffval[index] : -1;
}

// Takes one block's DC difference; its value in *diff. False on a bad code.
DCLUMA_INLINE bool DecodeDc(BitReader& bits, const HuffTable& table, int* diff) {
  bits.Fill();
  const int s = DecodeSymbol(bits, table);
  if (s < 0) return false;
  if (s == 0) {
    *diff = 0;
    return true;
  }
  const int r = static_cast<int>(bits.Peek(s));
  bits.Skip(s);
  // A value whose top bit is 0 is negative (the format's EXTEND).
  *diff = r < (1 << (s - 1)) ? r - (1 << s) + 1 : r;
  return true;
}

// Skips one block's DC difference.
DCLUMA_INLINE bool SkipDc(BitReader& bits, const HuffTable& table) {
  bits.Fill();
  const int s = DecodeSymbol(bits, table);
  if (s < 0) return false;
  bits.Skip(s);
  return true;
}

// Takes one step of AC symbols at block position *k if the block has room for it: +1 when
// the block goes on, 0 when it ended, -1 when the step does not apply (the symbol at the
// front is long, or the block's end is near) and nothing was taken.
DCLUMA_INLINE int TakeStep(BitReader& bits, const HuffTable& table, int* k) {
  const int step = table.step[bits.Peek(kStepBits)];
  const int room = step >> 4 & 0x7F;
  if (*k + room > DCTSIZE2) return -1;
  bits.Skip(step & 0xF);
  if ((step & 0x800) != 0) return 0;
  *k += room;
  return *k < DCTSIZE2 ? 1 : 0;
}

// Skips one block's AC coefficients: runs of whole symbols at a time while the block has
// room for them, one symbol at a time near its end.
DCLUMA_INLINE bool SkipAc(BitReader& bits, const HuffTable& table) {
  int k = 1;
  for (;;) {
    bits.Fill();
    int taken = TakeStep(bits, table, &k);
    if (taken > 0) taken = TakeStep(bits, table, &k);
    if (taken > 0) taken = TakeStep(bits, table, &k);
    if (taken > 0) continue;
    if (taken == 0) return true;
    bits.Fill();
    const int symbol = DecodeSymbol(bits, table);
    if (symbol < 0) return false;
    bits.Skip(symbol & 15);
    const int move = Advance(symbol);
    if (move == 0) return true;
    k += move;
    if (k >= DCTSIZE2) return true;
  }
}

// libjpeg's post-IDCT range limit: x & 1023 looked up in a table that clamps to 0..255
// what a sane coefficient gives and wraps what a wild one gives.
inline uint8_t RangeLimit(int x) {
  const int i = x & 1023;
  if (i < 128) return static_cast<uint8_t>(128 + i);
  if (i < 512) return 255;
  if (i < 896) return 0;
  return static_cast<uint8_t>(i - 896);
}

// One component of the scan, as the MCU loop needs it.
struct ScanComponent {
  int blocks_wide;  // blocks per MCU across and down
  int blocks_high;
  const HuffTable* dc;
  const HuffTable* ac;
  bool luma;
};

// Whether the data taken so far end at the marker `expected` (after any fill bytes), with
// nothing before it but the last byte's padding bits; sets *length to the marker's length
// with the fill bytes.
DCLUMA_INLINE bool AtMarker(const BitReader& bits, const uint8_t* end, int expected, int* length) {
  if (bits.Overran() || bits.Unused() >= 8) return false;
  const uint8_t* p = bits.Position();
  const uint8_t* q = p;
  while (q < end && *q == 0xFF) ++q;
  if (q == p || q == end || *q != expected) return false;
  *length = static_cast<int>(q + 1 - p);
  return true;
}

}  // namespace

struct DcLumaDecoder::Tables {
  std::array<HuffTable, NUM_HUFF_TBLS> dc;
  std::array<HuffTable, NUM_HUFF_TBLS> ac;
  // What each slot held in the last frame, when that was not the table made, and that
  // frame's number.
  std::array<HuffSource, NUM_HUFF_TBLS> dc_seen;
  std::array<HuffSource, NUM_HUFF_TBLS> ac_seen;
  std::array<uint64_t, NUM_HUFF_TBLS> dc_seen_in{};
  std::array<uint64_t, NUM_HUFF_TBLS> ac_seen_in{};
  uint64_t frame = 0;  // the number of the frame being decoded

  // The made table for slot `n`, or null when the frame has none there or a bad one. A
  // table is made the second time in a row it comes: making one costs about as much as
  // decoding a small frame, which a camera that changes its tables at every frame would
  // pay each time.
  const HuffTable* Get(const jpeg_decompress_struct& cinfo, int n, bool is_dc) {
    if (n < 0 || n >= NUM_HUFF_TBLS) return nullptr;
    const JHUFF_TBL* source = is_dc ? cinfo.dc_huff_tbl_ptrs[n] : cinfo.ac_huff_tbl_ptrs[n];
    if (source == nullptr) return nullptr;
    HuffTable& table = is_dc ? dc[n] : ac[n];
    HuffSource& seen = is_dc ? dc_seen[n] : ac_seen[n];
    if (table.made_from.Equals(*source)) {
      seen.set = false;  // whatever came before this frame did not come twice in a row
      return &table;
    }
    uint64_t& seen_in = is_dc ? dc_seen_in[n] : ac_seen_in[n];
    if (!seen.Equals(*source) || seen_in == frame) {
      seen.Assign(*source);  // components that share the slot ask again in the same frame
      seen_in = frame;
      return nullptr;
    }
    return table.Make(*source, is_dc) ? &table : nullptr;
  }
};

DcLumaDecoder::DcLumaDecoder() = default;
DcLumaDecoder::~DcLumaDecoder() = default;

bool DcLumaDecoder::Decode(const jpeg_decompress_struct& cinfo, uint8_t* out, int width,
                           int height) {
  // What this decoder takes; the library decodes the rest.
  const bool grey = cinfo.jpeg_color_space == JCS_GRAYSCALE && cinfo.num_components == 1;
  const bool ycc = cinfo.jpeg_color_space == JCS_YCbCr && cinfo.num_components == 3;
  if ((!grey && !ycc) || cinfo.progressive_mode || cinfo.arith_code ||
      cinfo.data_precision != 8 || cinfo.comps_in_scan != cinfo.num_components ||
      cinfo.Ss != 0 || cinfo.Se != DCTSIZE2 - 1 || cinfo.Ah != 0 || cinfo.Al != 0 ||
      cinfo.err->num_warnings != 0 || cinfo.src == nullptr) {
    return false;
  }
  const jpeg_component_info& y = cinfo.comp_info[0];
  if (y.h_samp_factor != cinfo.max_h_samp_factor || y.v_samp_factor != cinfo.max_v_samp_factor) {
    return false;
  }
  const int out_width = static_cast<int>((cinfo.image_width + 7) / 8);
  const int out_height = static_cast<int>((cinfo.image_height + 7) / 8);
  if (width != out_width || height != out_height) return false;

  if (tables_ == nullptr) {
    tables_.reset(new (std::nothrow) Tables);
    if (tables_ == nullptr) return false;
  }

  // The MCU: one block of the one component, or each component's sampling factors.
  ScanComponent scan[MAX_COMPS_IN_SCAN];
  int blocks_in_mcu = 0;
  bool tables = true;  // every table is made; all are asked for, so that all count as seen
  int lumas = 0;
  ++tables_->frame;
  for (int i = 0; i < cinfo.comps_in_scan; ++i) {
    const jpeg_component_info* c = cinfo.cur_comp_info[i];
    // The library refuses a frame whose component has no quantization table.
    if (c == nullptr || c->quant_tbl_no < 0 || c->quant_tbl_no >= NUM_QUANT_TBLS ||
        cinfo.quant_tbl_ptrs[c->quant_tbl_no] == nullptr) {
      return false;
    }
    ScanComponent& s = scan[i];
    s.luma = c == &y;
    lumas += s.luma ? 1 : 0;
    s.blocks_wide = grey ? 1 : c->h_samp_factor;
    s.blocks_high = grey ? 1 : c->v_samp_factor;
    s.dc = tables_->Get(cinfo, c->dc_tbl_no, true);
    s.ac = tables_->Get(cinfo, c->ac_tbl_no, false);
    tables = tables && s.dc != nullptr && s.ac != nullptr;
    blocks_in_mcu += s.blocks_wide * s.blocks_high;
  }
  if (!tables || lumas != 1 || blocks_in_mcu > kMaxBlocksInMcu) return false;
  const int q = cinfo.quant_tbl_ptrs[y.quant_tbl_no]->quantval[0];
  const int mcu_wide = grey ? 1 : cinfo.max_h_samp_factor;  // luma blocks per MCU across
  const int mcu_high = grey ? 1 : cinfo.max_v_samp_factor;
  const int mcus_per_row = (out_width + mcu_wide - 1) / mcu_wide;
  const int mcu_rows = (out_height + mcu_high - 1) / mcu_high;

  const uint8_t* const end = cinfo.src->next_input_byte + cinfo.src->bytes_in_buffer;
  BitReader bits(cinfo.src->next_input_byte, end);
  const unsigned int interval = cinfo.restart_interval;
  unsigned int left_in_interval = interval;
  int next_restart = 0;
  int predictor[MAX_COMPS_IN_SCAN] = {0, 0, 0, 0};

  for (int my = 0; my < mcu_rows; ++my) {
    for (int mx = 0; mx < mcus_per_row; ++mx) {
      if (interval != 0) {
        if (left_in_interval == 0) {
          int length = 0;
          if (!AtMarker(bits, end, JPEG_RST0 + next_restart, &length)) return false;
          bits.Restart(length);
          next_restart = (next_restart + 1) & 7;
          left_in_interval = interval;
          std::fill(std::begin(predictor), std::end(predictor), 0);
        }
        --left_in_interval;
      }
      for (int i = 0; i < cinfo.comps_in_scan; ++i) {
        const ScanComponent& s = scan[i];
        for (int by = 0; by < s.blocks_high; ++by) {
          for (int bx = 0; bx < s.blocks_wide; ++bx) {
            if (!s.luma) {
              if (!SkipDc(bits, *s.dc) || !SkipAc(bits, *s.ac)) return false;
              continue;
            }
            int diff = 0;
            if (!DecodeDc(bits, *s.dc, &diff)) return false;
            // libjpeg keeps the coefficient in 16 bits; a sum outside them is wild data.
            const int dc = predictor[i] + diff;
            if (dc < -32768 || dc > 32767) return false;
            predictor[i] = dc;
            if (!SkipAc(bits, *s.ac)) return false;
            const int x = mx * mcu_wide + bx, row = my * mcu_high + by;
            if (x < out_width && row < out_height) {
              out[static_cast<size_t>(row) * out_width + x] = RangeLimit((dc * q + 4) >> 3);
            }
          }
        }
      }
    }
  }
  // The scan must end at the frame's end: anything else that may follow is the library's
  // business, with its warnings.
  int length = 0;
  return AtMarker(bits, end, JPEG_EOI, &length);
}
