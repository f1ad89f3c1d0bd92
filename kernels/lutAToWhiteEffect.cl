// Program "lutAToWhiteEffect", kernel "lut_a_to_white_effect": BGRA8 frame buffers (rows packed,
// one work item per pixel). A pixel with any alpha is copied; a fully transparent one becomes
// opaque black, as the CPU effect does.
kernel void lut_a_to_white_effect(global const uchar4* src, global uchar4* dst) {
  const size_t i = get_global_id(1) * get_global_size(0) + get_global_id(0);
  const uchar4 p = src[i];
  dst[i] = p.w != 0 ? p : (uchar4)(0, 0, 0, 255);
}
