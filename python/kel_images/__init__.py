"""kel_images: integer, bit-exact routines on small greyscale pictures held in numpy arrays.

Pictures are 2-D, C-contiguous numpy arrays of uint8 (int8 for the signed rotations), read in
place. Functions that make a new picture return it; the drawing and compositing functions write
into the array they are given. Bad arguments raise TypeError or ValueError.
"""

from ._kel_images import (blend_image, brighten, darken, draw_circle, draw_image, draw_line,
                          draw_number, draw_rectangle, draw_triangle, get_mask, hist_mean,
                          hist_std, hist_var, histogram, histogram_n, mask_image, rotate,
                          set_pixel, std, var)

__all__ = ["blend_image", "brighten", "darken", "draw_circle", "draw_image", "draw_line",
           "draw_number", "draw_rectangle", "draw_triangle", "get_mask", "hist_mean", "hist_std",
           "hist_var", "histogram", "histogram_n", "mask_image", "rotate", "set_pixel", "std",
           "var"]
