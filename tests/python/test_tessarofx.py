# The Python module against the tool: the same image through `tessarofx apply`, `fx` and `lut`
# must give the same bytes. TFX_TOOL names the tool; PYTHONPATH finds the module (CTest sets
# both).
import json
import os
import subprocess
from concurrent.futures import ThreadPoolExecutor

import numpy as np
import pytest

import tessarofx as tfx

TOOL = os.environ.get("TFX_TOOL", "tessarofx")


def tool(*args):
    run = subprocess.run([TOOL, "-q", *map(str, args)], capture_output=True, text=True)
    assert run.returncode == 0, run.stderr
    return run.stdout


# Random pixels with a transparent top quarter and a green patch, so that the keyers and the
# alpha filter find work of their own.
def make_frame(key, height=48, width=64):
    rng = np.random.default_rng(key)
    frame = rng.integers(0, 256, size=(height, width, 4), dtype=np.uint8)
    frame[: height // 4, :, 3] = 0
    frame[height // 2 :, : width // 3, :3] = (30, 220, 40)  # BGR
    return frame


@pytest.fixture(scope="module")
def files(tmp_path_factory):
    d = tmp_path_factory.mktemp("frames")
    img, bg = make_frame(1234), make_frame(4321)
    tfx.write_image(d / "in.png", img)
    tfx.write_image(d / "bg.png", bg)
    tfx.bake_lut([("ColorAdjust", {"u_contrast": 40})], size=17).write(d / "look.cube")
    return d, img, bg


def tool_image(d, *args):
    tool(*args)
    return tfx.read_image(d / "out.png")


FILTERS = [
    ("ColorAdjust", dict(u_exposure=20, u_brightness=-10.5, u_contrast=30, u_vib=40, u_sat=25)),
    ("WhiteBalanceAdjust", dict(u_temperature=30, u_tint=-20)),
    ("ChromeKeyCombine", {}),
    ("Lut", "lut"),
    ("VignetteAdjust", dict(amount=-60, size=40, feather=70, roundness=30)),
    ("lutAToWhiteEffect", {}),
    ("HSLAdjust", dict(u_green_hue=40, u_red_sat=-50, u_blue_light=30)),
    ("DistortionFringingAdjust", dict(distortion=40, fringing=-30)),
    ("LightAdjust", dict(u_highLight=-30, u_shadow=40, u_blackLevel=-20)),
    ("ChromeKeyLut3dCL", dict(green=220, red=30, blue=40, contrast=70, mode=1)),
]


def test_filters_are_the_tools_list():
    listed = json.loads(tool("list", "--json"))["filters"]
    mine = tfx.filters()
    assert [f.name for f in mine] == [name for name, _ in FILTERS]
    for f, entry in zip(mine, listed):
        assert (f.index, f.guid, f.name, list(f.aliases), f.cpu, f.opencl, f.summary) == (
            entry["index"], entry["guid"], entry["name"], entry["aliases"], entry["cpu"],
            entry["opencl"], entry["summary"])
        for p, q in zip(f.params, entry["parameters"], strict=True):
            assert (p.name, p.type, p.default, p.meaning) == (q["name"], q["type"], q["default"],
                                                             q["meaning"])
            assert (p.min, p.max) == (q.get("min"), q.get("max"))


@pytest.mark.parametrize("name,params", FILTERS, ids=[f[0] for f in FILTERS])
def test_every_filter_gives_the_tools_bytes(files, name, params):
    d, img, bg = files
    params = {"lut3dPath": str(d / "look.cube")} if params == "lut" else params
    argv = ["apply", name] + [a for k, v in params.items() for a in ("-p", f"{k}={v}")]
    if name == "ChromeKeyCombine":
        argv += ["-b", d / "bg.png"]
    expected = tool_image(d, *argv, d / "in.png", d / "out.png")
    f = tfx.Filter(name, **params)
    background = bg if name == "ChromeKeyCombine" else None
    # A destination full of noise shows any pixel a filter leaves unwritten.
    out = np.full_like(img, 0x5A)
    assert f(img, background, out=out) is out
    np.testing.assert_array_equal(out, expected)
    # The object keeps working frame after frame, in place too, and apply() is the same call.
    np.testing.assert_array_equal(f(img, background), expected)
    np.testing.assert_array_equal(f(out, background, out=out), f(expected, background))
    np.testing.assert_array_equal(tfx.apply(img, name, background=background, **params), expected)


def test_chain_is_the_tools_chain(files):
    d, img, _ = files
    expected = tool_image(d, "apply", "-f", "ColorAdjust", "-p", "u_sat=60", "-f", "VignetteAdjust",
                          "-p", "amount=-40", d / "in.png", d / "out.png")
    chain = [tfx.Filter("ColorAdjust", u_sat=60), tfx.Filter("VignetteAdjust", amount=-40)]
    np.testing.assert_array_equal(tfx.apply(img, chain), expected)


@pytest.mark.parametrize("call", [
    lambda x, order: tfx.Filter("HSLAdjust", u_red_hue=50)(x, order=order),
    lambda x, order: tfx.apply(x, [tfx.Filter("ColorAdjust", u_sat=60),
                                   tfx.Filter("VignetteAdjust", amount=-40)], order=order),
    lambda x, order: tfx.clarity(x, 60, order=order),
    lambda x, order: tfx.frame(x, 255, 0, 0, 255, 3, order=order),
    lambda x, order: tfx.read_lut(os.environ["TFX_TEST_LUT"]).apply(x, order=order),
], ids=["filter", "chain", "function", "resizing-function", "lut"])
def test_orders_reorder_the_bgra_bytes(files, call, monkeypatch):
    d, img, _ = files
    monkeypatch.setenv("TFX_TEST_LUT", str(d / "look.cube"))
    bgra = call(img, "bgra")
    np.testing.assert_array_equal(call(np.ascontiguousarray(img[..., [2, 1, 0, 3]]), "rgba"),
                                  bgra[..., [2, 1, 0, 3]])
    opaque = img.copy()
    opaque[..., 3] = 255
    np.testing.assert_array_equal(call(np.ascontiguousarray(img[..., 2::-1]), "rgb"),
                                  call(opaque, "bgra")[..., 2::-1])
    np.testing.assert_array_equal(call(np.ascontiguousarray(img[..., :3]), "bgr"),
                                  call(opaque, "bgra")[..., :3])


def test_strided_views_are_read_through_their_strides(files):
    _, img, _ = files
    f = tfx.Filter("DistortionFringingAdjust", distortion=50)
    expected = f(img)
    rows = np.zeros((100, 150, 4), np.uint8)
    rows[10:58, 20:84] = img
    pixels = np.zeros((48, 128, 4), np.uint8)
    pixels[:, ::2] = img
    views = [rows[10:58, 20:84], pixels[:, ::2], np.asfortranarray(img),
             np.ascontiguousarray(img.transpose(1, 0, 2)).transpose(1, 0, 2)]
    for view in views:
        np.testing.assert_array_equal(f(view), expected)
    np.testing.assert_array_equal(f(img[::-1]), f(np.ascontiguousarray(img[::-1])))


# Every function takes the one path of the tool's table, whose every entry the tool tests run: one
# of each kind of argument (a renamed one, fractions, negatives) and of result size suffices.
FX = [
    ("blur", [4]), ("stack-pass", [3, 2]), ("dct-denoise", [12.5]), ("grain", [30, 50]),
    ("hsl", [3, 40, -20, 10, 0, 0]), ("frame", [255, 0, 0, 255, 4]), ("clip", [30, 20]),
]


@pytest.mark.parametrize("name,args", FX, ids=[f[0] for f in FX])
def test_functions_give_fx_bytes(files, name, args):
    d, img, _ = files
    expected = tool_image(d, "fx", name, *args, d / "in.png", d / "out.png")
    fn = getattr(tfx, name.replace("-", "_"))
    np.testing.assert_array_equal(fn(img, *args), expected)


def test_library_names_and_two_image_functions(files):
    d, img, bg = files
    assert tfx.gaussianBlur is tfx.blur is tfx.gaussian_blur
    assert tfx.mergeImage is tfx.merge
    expected = tool_image(d, "fx", "merge", 5, -3, 80, 100, d / "in.png", d / "bg.png", d / "out.png")
    np.testing.assert_array_equal(tfx.merge(img, bg, x=5, y=-3, over=80, under=100), expected)
    printed = tool("fx", "white-point", d / "in.png")
    wp = tfx.white_point(img)
    assert "R %d G %d B %d" % wp["mean"] in printed and f"{wp['kelvin']} K" in printed
    printed = tool("fx", "wb-rates", d / "in.png", d / "bg.png")
    assert all(f"{v:.2f}" in printed for v in tfx.wb_rates(img, bg))


def test_luts_match_the_tool(files, tmp_path):
    d, img, _ = files

    def same_file(a, b):
        assert (tmp_path / a).read_bytes() == (tmp_path / b).read_bytes()

    def tool_lut_image(name):
        return tool_image(d, "apply", "Lut", "-p", f"lut3dPath={tmp_path / name}", d / "in.png",
                          d / "out.png")

    tool("lut", "bake", "-f", "LightAdjust", "-p", "u_shadow=30", "-f", "ColorAdjust", "-p",
         "u_exposure=-12.5", "--size", 21, tmp_path / "tool.cube")
    tfx.bake_lut([tfx.Filter("LightAdjust", u_shadow=30), ("ColorAdjust", {"u_exposure": -12.5})],
                 size=21).write(tmp_path / "mine.cube")
    same_file("mine.cube", "tool.cube")
    read = tfx.read_lut(tmp_path / "tool.cube")
    assert read.size == 21 and read.table.shape == (21, 21, 21, 3)
    np.testing.assert_array_equal(read.apply(img), tool_lut_image("tool.cube"))

    # A .3dl goes through the plug-in's own reader, for a table and for the filter alike.
    rows = np.random.default_rng(2).integers(0, 4096, (27, 3))
    (tmp_path / "grade.3dl").write_text("3DMESH\nMesh 0 12\n0 2047 4095\n" +
                                        "".join("%d %d %d\n" % tuple(r) for r in rows))
    dl = tfx.read_lut(tmp_path / "grade.3dl")
    np.testing.assert_array_equal(dl.apply(img), tool_lut_image("grade.3dl"))
    dl.write(tmp_path / "mine3.cube")
    tool("lut", "convert", tmp_path / "grade.3dl", tmp_path / "tool3.cube")
    same_file("mine3.cube", "tool3.cube")

    # Larger than the plug-in holds: refused without a size, resampled as `lut convert` does.
    axis = np.linspace(0, 1, 66)
    b, g, r = np.meshgrid(axis, axis, axis, indexing="ij")
    (tmp_path / "big.cube").write_text("LUT_3D_SIZE 66\n" + "".join(
        f"{x:.6f} {y:.6f} {z:.6f}\n" for x, y, z in zip(r.ravel() ** 0.8, g.ravel(), b.ravel())))
    with pytest.raises(tfx.LutError, match="66"):
        tfx.read_lut(tmp_path / "big.cube")
    tfx.read_lut(tmp_path / "big.cube", size=33).write(tmp_path / "mine33.cube")
    tool("lut", "convert", tmp_path / "big.cube", tmp_path / "tool33.cube", "--size", 33)
    same_file("mine33.cube", "tool33.cube")


@pytest.mark.parametrize("frame,error", [
    ([[[0, 0, 0, 0]]], TypeError),
    (np.zeros((4, 4, 4), np.float32), TypeError),
    (np.zeros((4, 4, 4), np.uint16), TypeError),
    (np.zeros((4, 4), np.uint8), ValueError),
    (np.zeros((4, 4, 3), np.uint8), ValueError),
    (np.zeros((0, 4, 4), np.uint8), ValueError),
])
def test_bad_arrays(frame, error):
    with pytest.raises(error, match=r"H x W x 4 uint8"):
        tfx.Filter("ColorAdjust")(frame)
    with pytest.raises(error, match=r"H x W x 4 uint8"):
        tfx.blur(frame, 3)


@pytest.mark.parametrize("make,match", [
    (lambda: tfx.Filter("NoSuchFilter"), "unknown filter 'NoSuchFilter'"),
    (lambda: tfx.Filter("ColorAdjust", u_bogus=1), "no parameter 'u_bogus'"),
    (lambda: tfx.Filter("ColorAdjust", u_exposure=101), r"outside its range -100\.\.100"),
    (lambda: tfx.Filter("ChromeKeyLut3d", mode=0.5), "not an integer"),
    (lambda: tfx.Filter("ColorAdjust", device=0), "no OpenCL class"),
    (lambda: tfx.sharpen(np.zeros((4, 4, 4), np.uint8), 5000), "outside its range"),
    (lambda: tfx.bake_lut(["VignetteAdjust"]), "cannot be baked"),
    (lambda: tfx.bake_lut(["ColorAdjust"], size=65), "2 to 64"),
])
def test_bad_names_and_values(make, match):
    with pytest.raises(tfx.ParameterError, match=match) as caught:
        make()
    assert isinstance(caught.value, ValueError) and caught.value.code == 0


def test_bad_calls_and_files(tmp_path):
    frame = np.zeros((8, 8, 4), np.uint8)
    with pytest.raises(ValueError, match="order"):
        tfx.apply(frame, "ColorAdjust", order="argb")
    with pytest.raises(TypeError):
        tfx.blur(frame)
    with pytest.raises(TypeError, match="bool"):
        tfx.Filter("ColorAdjust", u_exposure=True)
    with pytest.raises(TypeError, match="frame first"):
        tfx.apply("ColorAdjust", frame)
    with pytest.raises(ValueError, match="background"):
        tfx.Filter("ChromeKeyCombine")(frame, np.zeros((4, 8, 4), np.uint8))
    # A failure inside Running keeps the library's code.
    with pytest.raises(tfx.Error) as caught:
        tfx.Filter("Lut")(frame)
    assert caught.value.code == 0x80000008 and "0x80000008" in str(caught.value)
    (tmp_path / "bad.cube").write_text("LUT_3D_SIZE 2\n0 0 0\n1 1\n")
    for path, match in [(tmp_path / "missing.cube", "cannot be opened"),
                        (tmp_path / "bad.cube", r"bad\.cube, line 3"),
                        (tmp_path / "look.png", "not a .cube or .3dl")]:
        with pytest.raises(tfx.LutError, match=match):
            tfx.read_lut(path)
    with pytest.raises(tfx.LutError, match=".cube"):
        tfx.bake_lut([]).write(tmp_path / "out.3dl")


def test_threads_over_separate_filters_give_the_serial_bytes(files):
    _, img, _ = files
    frames = [np.roll(img, k, axis=1) for k in range(8)]
    made = [dict(u_exposure=10 * k, u_sat=-5 * k) for k in range(4)]
    serial = [[tfx.Filter("ColorAdjust", **p)(x) for x in frames] for p in made]

    def work(p):
        f = tfx.Filter("ColorAdjust", **p)
        return [f(x) for x in frames for _ in range(3)][::3]

    with ThreadPoolExecutor(len(made)) as pool:
        parallel = list(pool.map(work, made))
    np.testing.assert_array_equal(np.array(parallel), np.array(serial))


def test_opencl_class_gives_the_tools_bytes(files):
    d, img, _ = files
    try:
        if not tfx.devices():
            pytest.skip("no OpenCL device")
    except tfx.Error as e:
        pytest.skip(str(e))
    expected = tool_image(d, "apply", "--opencl", "WhiteBalanceAdjust", "-p", "u_temperature=40",
                          d / "in.png", d / "out.png")
    f = tfx.Filter("WhiteBalanceAdjust", device=-1, u_temperature=40)
    assert f.device
    np.testing.assert_array_equal(f(img), expected)
