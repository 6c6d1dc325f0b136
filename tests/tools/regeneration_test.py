#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Makes what scripts have made anew, in one setting of BLAS and processor, and compares it.

The model is in data/, the assets are in examples/assets/. Numbers and meshes have to be the same
bits, pictures the same pixels. A setting stands for the machines that differ in it: the BLAS that
numpy calls, and the instructions that numpy, the C library and OpenBLAS choose by the processor.
"""

import argparse
import os
import re
import shutil
import subprocess
import sys
import sysconfig
from pathlib import Path
from typing import NamedTuple

MODEL = ["face_model.bin", "triangles.inc", "texture_coordinates.inc", "expression_names.inc",
         "face.obj", "head_occluder.obj", "face_template.png", "template/mask_area.png",
         "template/wireframe.png", "template/feature_lines.png", "template/landmark_numbers.png"]
ASSETS = ["glasses.obj", "glasses.mtl", "hat.obj", "hat.mtl", "mask_carnival.png",
          "mask_tiger.png", "mask_gold.png"]

# What is made: scripts under tools/ with the option for their folder, where it lies, the files.
MAKERS = {
    "model": ([("face_model/generate.py", "--out"), ("face_model/artists.py", "--data")],
              "data", MODEL),
    "assets": ([("assets/make_sticker_assets.py", "--out"),
                ("assets/make_mask_textures.py", "--out")], "examples/assets", ASSETS),
    "outline": ([("face_model/outline_rows.py", "--out")], "data",
                ["outline_rows.inc", "outline_normals.inc"]),
}


class Setting(NamedTuple):
    """None leaves the choice to the library."""
    folders: tuple[str, ...]  # of the BLAS and the LAPACK
    numpy_without: str | None = None  # names of instructions start so; empty for all optional ones
    libc_without: str | None = None
    openblas_kernels: str | None = None


SETTINGS = {
    "reference": Setting(("blas", "lapack")),
    "atlas_baseline": Setting(
        ("atlas",), numpy_without="",
        libc_without="-AVX,-AVX2,-FMA,-FMA4,-AVX512F,-AVX512VL,-AVX512BW,-AVX512DQ,-AVX512CD"),
    "openblas": Setting(("openblas-pthread",), numpy_without="AVX512"),
    "openblas_prescott": Setting(("openblas-pthread",), openblas_kernels="Prescott"),
}
LIBRARIES = Path("/usr/lib") / sysconfig.get_config_var("MULTIARCH")

# Prints numpy's optional instructions and the BLAS libraries that the process has loaded.
PROBE = r"""
import re
import scipy.cluster, scipy.spatial, scipy.sparse.linalg
import PIL.Image
import numpy.core._multiarray_umath as core
print(*core.__cpu_dispatch__)
print(*set(re.findall(r"/\S*/lib(?:blas|lapack)\.so\S*", open("/proc/self/maps").read())))
"""


def probed(environment):
    """Numpy's optional instructions, and the folders of the BLAS and LAPACK in use."""
    probe = subprocess.run([sys.executable, "-c", PROBE], env=environment, text=True,
                           stdout=subprocess.PIPE)
    if probe.returncode != 0:
        sys.exit("install the packages of `scripts/install_packages.sh test`")
    features, libraries = probe.stdout.splitlines()
    return features.split(), {str(Path(library).parent) for library in libraries.split()}


def environment_of(setting):
    """The environment variables of a setting."""
    chosen = SETTINGS[setting]
    folders = [str(LIBRARIES / folder) for folder in chosen.folders]
    environment = dict(os.environ, LD_LIBRARY_PATH=":".join(folders), OPENBLAS_NUM_THREADS="1")
    features, used = probed(environment)
    if not used or not used.issubset(folders):
        sys.exit(f"numpy uses {' '.join(sorted(used)) or 'a BLAS of its own'} instead of "
                 f"{' '.join(folders)}; install the packages of `scripts/install_packages.sh test`")
    if chosen.numpy_without is not None:
        environment["NPY_DISABLE_CPU_FEATURES"] = " ".join(
            feature for feature in features if feature.startswith(chosen.numpy_without))
    if chosen.libc_without is not None:
        environment["GLIBC_TUNABLES"] = f"glibc.cpu.hwcaps={chosen.libc_without}"
    if chosen.openblas_kernels is not None:
        environment["OPENBLAS_CORETYPE"] = chosen.openblas_kernels
    return environment


def picture_difference(made, kept):
    from PIL import Image, ImageChops
    pictures = [Image.open(path).convert("RGBA") for path in (made, kept)]
    if pictures[0].size != pictures[1].size:
        return f"{pictures[0].size} instead of {pictures[1].size} pixels"
    bands = ImageChops.difference(*pictures).split()
    furthest = max(high for _, high in (band.getextrema() for band in bands))
    return f"colours differ by up to {furthest} of 255" if furthest else ""


def model_difference(made, kept):
    import numpy as np
    import writer
    parts = []
    blocks = zip(("mean", "identity", "expression", "tensor"), writer.read_model(made),
                 writer.read_model(kept))
    for name, a, b in blocks:
        apart = np.abs(a.astype(float) - b) if a.shape == b.shape else np.array([np.inf])
        if apart.any():
            unit = "steps" if name == "tensor" else "mm"
            parts.append(f"{name}: {(apart > 0).sum()} of {b.size} values by up to "
                         f"{apart.max():.4g} {unit}")
    return "; ".join(parts) or "bytes beside the values"


def text_difference(made, kept):
    lines = [path.read_text().splitlines() for path in (made, kept)]
    if len(lines[0]) != len(lines[1]):
        return f"{len(lines[0])} instead of {len(lines[1])} lines"
    apart = sum(a != b for a, b in zip(*lines))
    numbers = [[float(word) for word in re.findall(r"-?\d+(?:\.\d+)?", "\n".join(text))]
               for text in lines]
    furthest = max((abs(a - b) for a, b in zip(*numbers)), default=0.0)
    return f"{apart} of {len(lines[1])} lines, numbers by up to {furthest:.4g}"


def difference(made, kept):
    """What is different between two files; empty if they are the same."""
    if not made.is_file():
        return "not made"
    if made.suffix == ".png":
        return picture_difference(made, kept)
    if made.read_bytes() == kept.read_bytes():
        return ""
    return (model_difference if made.suffix == ".bin" else text_difference)(made, kept)


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("source", type=Path, help="root of the project")
    parser.add_argument("scratch", type=Path, help="folder to write to, emptied first")
    parser.add_argument("what", choices=MAKERS)
    parser.add_argument("setting", choices=SETTINGS)
    arguments = parser.parse_args()
    source, scratch, setting = arguments.source, arguments.scratch, arguments.setting
    scripts, folder, names = MAKERS[arguments.what]

    environment = environment_of(setting)
    shutil.rmtree(scratch, ignore_errors=True)
    scratch.mkdir(parents=True)
    for script, option in scripts:
        run = subprocess.run([sys.executable, source / "tools" / script, option, scratch],
                             env=environment, text=True, stderr=subprocess.PIPE)
        print(run.stderr, end="")
        if run.returncode != 0 or "warning: " in run.stderr:
            sys.exit(f"setting {setting}: tools/{script} failed or warned")

    sys.path.insert(0, str(source / "tools" / "face_model"))
    failed = False
    for name in names:
        apart = difference(scratch / name, source / folder / name)
        if apart:
            failed = True
            print(f"setting {setting}: {folder}/{name} is not what its script makes: {apart}")
    sys.exit(1 if failed else 0)


if __name__ == "__main__":
    main()
