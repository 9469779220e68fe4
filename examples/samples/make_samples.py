#!/usr/bin/env python3
"""Writes bouncing_ball.gltf beside this script: a ball that drops, bounces, rolls and squashes, with its data embedded.

translation  CUBICSPLINE  falls and rises on parabolas, so the tangents break at the ground
rotation     LINEAR       quaternions, a quarter turn a key
scale        STEP         squashed for two frames at each impact
"""

import base64
import json
import math
import pathlib
import struct

FPS = 24
GRAVITY = -9.81
FLOAT, SCALAR, VEC3, VEC4 = 5126, "SCALAR", "VEC3", "VEC4"


def frames(*numbers):
    return [n / FPS for n in numbers]


def bounces():
    """Impact and apex keys: (time, position, in-tangent, out-tangent)."""
    impact_frames = [0, 12, 30, 44, 54, 60]
    drift = 1.5  # to the side, a second
    keys = []
    for index, frame in enumerate(impact_frames):
        time = frame / FPS
        before = (frame - impact_frames[index - 1]) / FPS if index else None
        after = (impact_frames[index + 1] - frame) / FPS if index + 1 < len(impact_frames) else None
        # The first stretch is only the fall from the apex; each later one goes up and comes down again.
        if index == 0:
            height, speed_in, speed_out = -GRAVITY / 2 * after**2, 0.0, 0.0
        else:
            height = 0.0
            speed_in = GRAVITY * (before if index == 1 else before / 2)
            speed_out = -GRAVITY * after / 2 if after else 0.0
        if after is None:
            drift_out = 0.0
        else:
            drift_out = drift
        keys.append((time, (drift * time, height, 0.0), (drift, speed_in, 0.0), (drift_out, speed_out, 0.0)))
    return keys


def spin():
    turns = [(time, index * math.pi / 2) for index, time in enumerate(frames(0, 15, 30, 45, 60))]
    return [(time, (0.0, 0.0, -math.sin(angle / 2), math.cos(angle / 2))) for time, angle in turns]


def squash():
    round_ball, flat = (1.0, 1.0, 1.0), (1.2, 0.7, 1.2)
    keys = [(0, round_ball)]
    for impact in (12, 30, 44, 54):
        keys += [(impact, flat), (impact + 2, round_ball)]
    return [(frame / FPS, value) for frame, value in keys]


class Document:
    def __init__(self):
        self.data = b""
        self.views = []
        self.accessors = []
        self.channels = []
        self.samplers = []

    def add(self, kind, rows):
        numbers = [number for row in rows for number in row]
        self.views.append({"buffer": 0, "byteOffset": len(self.data), "byteLength": 4 * len(numbers)})
        accessor = {"bufferView": len(self.views) - 1, "componentType": FLOAT, "count": len(rows), "type": kind}
        if kind == SCALAR:
            floats = struct.unpack(f"<{len(numbers)}f", struct.pack(f"<{len(numbers)}f", *numbers))
            accessor.update(min=[min(floats)], max=[max(floats)])
        self.accessors.append(accessor)
        self.data += struct.pack(f"<{len(numbers)}f", *numbers)
        return len(self.accessors) - 1

    def animate(self, path, interpolation, kind, times, rows):
        sampler = {
            "input": self.add(SCALAR, [(time,) for time in times]),
            "interpolation": interpolation,
            "output": self.add(kind, rows),
        }
        self.samplers.append(sampler)
        self.channels.append({"sampler": len(self.samplers) - 1, "target": {"node": 0, "path": path}})

    def write(self, path):
        uri = "data:application/octet-stream;base64," + base64.b64encode(self.data).decode()
        document = {
            "asset": {"version": "2.0"},
            "scene": 0,
            "scenes": [{"nodes": [0]}],
            "nodes": [{"name": "ball"}],
            "animations": [{"name": "bounce", "channels": self.channels, "samplers": self.samplers}],
            "accessors": self.accessors,
            "bufferViews": self.views,
            "buffers": [{"byteLength": len(self.data), "uri": uri}],
        }
        path.write_text(json.dumps(document, indent=1) + "\n")


def main():
    document = Document()
    fall = bounces()
    # A spline key is in-tangent, value, out-tangent.
    document.animate("translation", "CUBICSPLINE", VEC3, [key[0] for key in fall],
                     [row for _, value, before, after in fall for row in (before, value, after)])
    document.animate("rotation", "LINEAR", VEC4, [time for time, _ in spin()], [value for _, value in spin()])
    document.animate("scale", "STEP", VEC3, [time for time, _ in squash()], [value for _, value in squash()])
    document.write(pathlib.Path(__file__).resolve().parent / "bouncing_ball.gltf")


if __name__ == "__main__":
    main()
