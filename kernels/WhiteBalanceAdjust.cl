// Program "WhiteBalanceAdjust", kernel "auto_white_balance": BGRA8 frame buffers (rows packed,
// one work item per pixel). Blue, green and red are multiplied by k2, k3 and k4 in float and
// truncated into 0..255, as the CPU balance does; alpha passes through.

// Not needed for a single product, but it keeps the arithmetic exactly as written.
#pragma OPENCL FP_CONTRACT OFF

uchar scale_to_byte(uchar v, float k) {
  const float s = (float)v * k;
  if (!(s > 0.0f)) return 0;  // NaN too
  return s < 255.0f ? (uchar)(int)s : (uchar)255;
}

kernel void auto_white_balance(global const uchar4* src, global uchar4* dst, float k2, float k3,
                               float k4) {
  const size_t i = get_global_id(1) * get_global_size(0) + get_global_id(0);
  const uchar4 p = src[i];
  dst[i] = (uchar4)(scale_to_byte(p.x, k2), scale_to_byte(p.y, k3), scale_to_byte(p.z, k4), p.w);
}
