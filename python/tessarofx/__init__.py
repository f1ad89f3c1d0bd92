"""TessaroFx filters, image functions and 3D LUTs on NumPy arrays.

Frames are H x W x 4 ``uint8`` arrays in BGRA order, the library's own; every call takes
``order="rgba"``, ``"bgr"`` or ``"rgb"`` for arrays in another order (3-channel input is taken
as opaque, 3-channel output drops alpha). Results are new arrays in the caller's order.

    import tessarofx
    graded = tessarofx.apply(frame, "ColorAdjust", u_exposure=20)

    warm = tessarofx.Filter("WhiteBalanceAdjust", u_temperature=30)   # kept across frames
    for frame in frames:
        out = warm(frame)

    soft = tessarofx.gaussian_blur(frame, 8)          # also tessarofx.blur / gaussianBlur
    lut = tessarofx.read_lut("look.cube"); out = lut.apply(frame)

Failures raise tessarofx.Error (``.code`` is the library's result code); unknown names and
values outside their range raise tessarofx.ParameterError, also a ValueError; LUT files that
cannot be read or written raise tessarofx.LutError. Arrays of the wrong type raise TypeError,
of the wrong shape ValueError. The GIL is released while pixels are processed, so threads that
run different Filter objects run in parallel.
"""

import inspect
import numbers
import operator
import os
from dataclasses import dataclass
from typing import Optional, Tuple

from . import _native
from ._native import Error, LutError, ParameterError, from_bgra, set_log_level, to_bgra

__all__ = [
    "Error", "ParameterError", "LutError",
    "ParamInfo", "FilterInfo", "Device", "FunctionInfo",
    "filters", "devices", "functions",
    "Filter", "Chain", "apply",
    "Lut", "read_lut", "bake_lut",
    "read_image", "write_image", "to_bgra", "from_bgra", "set_log_level",
]


@dataclass(frozen=True)
class ParamInfo:
    name: str
    type: str  # "int", "double" or "string"
    default: object
    min: object  # None for strings
    max: object
    meaning: str


@dataclass(frozen=True)
class FilterInfo:
    index: int
    name: str
    guid: str
    cpu: bool
    opencl: bool
    summary: str
    aliases: Tuple[str, ...]
    inputs: int  # 2 for a filter that joins a background and a foreground
    params: Tuple[ParamInfo, ...]


@dataclass(frozen=True)
class Device:
    index: int
    type: str
    platform: str
    name: str
    default: bool  # the device Filter(device=-1) opens


def filters():
    """The ten published filters with their parameters, as ``tessarofx list`` shows them."""
    out = []
    for f in _native.filters():
        params = tuple(ParamInfo(**p) for p in f.pop("params"))
        f["aliases"] = tuple(f["aliases"])
        out.append(FilterInfo(params=params, **f))
    return out


def devices():
    """The OpenCL devices, with the index that Filter(..., device=INDEX) takes."""
    return [Device(**d) for d in _native.devices()]


def read_image(path, *, order="bgra"):
    """An image file as the tool reads it: any format OpenCV decodes, as 8-bit pixels (grey and
    colour images come out opaque)."""
    return _native.read_image(os.fspath(path), order)


def write_image(path, image, *, order="bgra"):
    """Writes an image file as the tool does, by its extension: PNG, TIFF and WebP keep alpha,
    JPEG and BMP drop it. The file is replaced in one step, never left half written."""
    _native.write_image(os.fspath(path), image, order)


def _setting_text(owner, name, value):
    # Settings travel as the tool's text, so a value is checked and rounded exactly as
    # ``-p NAME=VALUE`` is; repr() gives the float back bit for bit.
    if isinstance(value, bool):
        raise TypeError(f"{owner} {name}: expected a number, not a bool")
    if isinstance(value, str):
        return value
    if isinstance(value, os.PathLike):
        return os.fspath(value)
    try:
        return str(operator.index(value))
    except TypeError:
        pass
    if isinstance(value, numbers.Real):
        return repr(float(value))
    raise TypeError(f"{owner} {name}: expected a number or a string, not {type(value).__name__}")


class Filter:
    """One filter object, created once and run on frame after frame.

    ``Filter("ColorAdjust", u_exposure=20)``: NAME is a published name, a registered alias or a
    GUID; keyword arguments set parameters (see filters()). ``device=INDEX`` (-1 for the default
    choice, or a Device) creates the filter's OpenCL class instead, with programs from
    ``kernels`` or the directory beside the library. A Filter serves one thread at a time; give
    each thread its own.
    """

    def __init__(self, name, *, device=None, kernels=None, **params):
        if not isinstance(name, str):
            # The likeliest cause is apply()'s arguments swapped; pybind11's own message would
            # print the whole frame.
            raise TypeError(f"a filter is named by a string, not {type(name).__name__} "
                            "(apply takes the frame first: apply(frame, 'ColorAdjust', ...))")
        if isinstance(device, Device):
            device = device.index
        elif device is not None and (isinstance(device, bool) or not isinstance(device, int)):
            raise TypeError("device must be a device index, -1 or a tessarofx.Device")
        settings = [(k, _setting_text(name, k, v)) for k, v in params.items()]
        self._native = _native.NativeFilter(name, settings, device,
                                            os.fspath(kernels) if kernels else "")
        self._params = dict(params)

    def __call__(self, frame, background=None, *, order="bgra", out=None):
        """The filtered frame as a new array (or written into ``out``, an array of the frame's
        shape). ``background`` is the frame under this one, for filters that join two
        (ChromeKeyCombine); by default the frame itself."""
        return self._native.run(frame, background, order, out)

    def set_time(self, current, total):
        """The position in the clip that filters which change over time are told about."""
        self._native.set_time(current, total)

    @property
    def name(self):
        return self._native.name

    @property
    def guid(self):
        return self._native.guid

    @property
    def params(self):
        return dict(self._params)

    @property
    def device(self):
        """The OpenCL device's name, None on the CPU."""
        return self._native.device

    def __repr__(self):
        args = [repr(self.name)] + [f"{k}={v!r}" for k, v in self._params.items()]
        return f"tessarofx.Filter({', '.join(args)})"


class Chain:
    """Filters run one after another, as an editor stacks effects: each result is the next
    filter's input. Items are Filter objects or filter names. The background, if any, lies under
    the first filter only. Conversion to and from ``order`` happens once, at the ends."""

    def __init__(self, filters):
        self.filters = [f if isinstance(f, Filter) else Filter(f) for f in filters]

    def __call__(self, frame, background=None, *, order="bgra"):
        x = frame if order == "bgra" else to_bgra(frame, order)
        under = background if background is None or order == "bgra" else to_bgra(background, order)
        if not self.filters:
            x = to_bgra(x)
        for i, f in enumerate(self.filters):
            x = f(x, under if i == 0 else None)
        return x if order == "bgra" else from_bgra(x, order)

    def __repr__(self):
        return f"tessarofx.Chain({self.filters!r})"


def apply(frame, filter, *, background=None, order="bgra", device=None, kernels=None, **params):
    """One frame through a filter made for the call: ``apply(frame, "ColorAdjust",
    u_exposure=20)``. FILTER may also be a Filter, or a list of them (a Chain)."""
    if isinstance(filter, (list, tuple)):
        if params or device is not None:
            raise TypeError("parameters and device go to the Filter objects of a chain")
        return Chain(filter)(frame, background, order=order)
    if isinstance(filter, (Filter, Chain)):
        if params or device is not None:
            raise TypeError("parameters and device belong to the Filter, not to apply()")
        return filter(frame, background, order=order)
    return Filter(filter, device=device, kernels=kernels, **params)(frame, background, order=order)


# ---- image functions -------------------------------------------------------------------------


@dataclass(frozen=True)
class FunctionInfo:
    name: str  # the Python name
    function: str  # the library's, also bound in this module
    tool_name: str  # what ``tessarofx fx`` calls it
    args: Tuple[Tuple[str, float, float], ...]  # (name, min, max) in call order
    meaning: str


_FUNCTIONS = []


def functions():
    """The image functions: Python name, library name, arguments with their ranges."""
    return list(_FUNCTIONS)


def _arg_name(text):
    name = text.lower().rstrip("%")
    return name + "_" if name in ("pass",) else name


def _make_function(entry):
    tool_name = entry["name"]
    py_name = tool_name.replace("-", "_")
    args = [(_arg_name(a[0]), a[1], a[2]) for a in entry["args"]]
    images = ["image"] + ([entry["second"].lower() if entry["second"] else "second"]
                          if entry["inputs"] > 1 else [])

    if tool_name == "white-point":
        def call(image, *, order="bgra"):
            return _native.white_point(image, order)
        doc = ("The mean colour and what the white-balance estimators make of it: a dict of "
               "mean (R, G, B), xyz, xy, mireds and kelvin.")
    elif tool_name == "wb-rates":
        def call(image, corrected, *, order="bgra"):
            return _native.wb_rates(image, corrected, order)
        doc = ("(temperature change, tint change) from IMAGE to CORRECTED, in slider units; also "
               "calls getAutoWhiteBalanceTintChangeRate.")
    else:
        def call(*given, order="bgra", **named):
            bound = signature.bind(*given, **named)
            values = [bound.arguments[a[0]] for a in args]
            texts = [_setting_text(py_name, a[0], v) for a, v in zip(args, values)]
            second = bound.arguments.get(images[1]) if len(images) > 1 else None
            return _native.call_function(tool_name, bound.arguments["image"], texts, second,
                                         order)
        ranges = "\n".join(f"{a[0]}: {a[1]:g}..{a[2]:g}" for a in args)
        doc = entry["meaning"] + "." + ("\n\n" + ranges if ranges else "")
        if entry["also"]:
            doc += "\nAlso calls " + ", ".join(entry["also"]) + "."

    positional = inspect.Parameter.POSITIONAL_OR_KEYWORD
    signature = inspect.Signature(
        [inspect.Parameter(n, positional) for n in images]
        + ([inspect.Parameter(a[0], positional) for a in args] if entry["writes"] else [])
        + [inspect.Parameter("order", inspect.Parameter.KEYWORD_ONLY, default="bgra")])
    call.__name__ = call.__qualname__ = py_name
    call.__signature__ = signature
    call.__doc__ = f"{doc}\n\nThe library's {entry['function']}; ``tessarofx fx {tool_name}``."
    call.__module__ = __name__
    _FUNCTIONS.append(FunctionInfo(py_name, entry["function"], tool_name,
                                   tuple(entry["args"]), entry["meaning"]))
    return call


def _bind_functions(scope):
    for entry in _native.functions():
        fn = _make_function(entry)
        for name in (fn.__name__, entry["function"]):
            scope[name] = fn
            __all__.append(name)


_bind_functions(globals())
# The names image people reach for first.
gaussian_blur = blur
__all__.append("gaussian_blur")


# ---- LUTs ----------------------------------------------------------------------------------


class Lut:
    """A 3D LUT held by the library's CubeLut: at most 64 points per axis."""

    def __init__(self, native):
        self._native = native

    @classmethod
    def read(cls, path, size=None):
        return read_lut(path, size)

    @property
    def size(self):
        return self._native.size

    @property
    def title(self):
        return self._native.title

    @property
    def domain(self):
        """((min R, G, B), (max R, G, B)) from the file; 0..1 unless it said otherwise."""
        return self._native.domain

    @property
    def table(self):
        """A copy of the lattice as float32 [red][green][blue][channel], 0..255 for 0..1."""
        return self._native.table

    def write(self, path):
        """Writes the table as a .cube file through the library's writer."""
        self._native.write(os.fspath(path))

    def apply(self, frame, *, order="bgra"):
        """The frame through the table (the library's doLUT); alpha is kept."""
        return self._native.apply(frame, order)

    __call__ = apply

    def __repr__(self):
        return f"<tessarofx.Lut {self.size} points per axis{', ' + repr(self.title) if self.title else ''}>"


def read_lut(path, size=None):
    """Reads a .cube or .3dl file. Tables of more than 64 points per axis (.cube files go up to
    256) need ``size``, which resamples by the library's tetrahedral interpolation, as
    ``tessarofx lut convert --size`` does."""
    return Lut(_native.NativeLut.read(os.fspath(path), size))


def bake_lut(steps, size=33):
    """Bakes ColorAdjust, LightAdjust and WhiteBalanceAdjust settings, in order, into a table
    of ``size`` points per axis through the library's lut3d_ functions, as ``tessarofx lut bake``
    does. Steps are Filter objects, (name, {param: value}) pairs or bare names."""
    native_steps = []
    for step in steps:
        if isinstance(step, Filter):
            name, params = step.name, step.params
        elif isinstance(step, str):
            name, params = step, {}
        else:
            name, params = step
        native_steps.append(
            (name, [f"{k}={_setting_text(name, k, v)}" for k, v in params.items()]))
    return Lut(_native.NativeLut.bake(native_steps, size))
