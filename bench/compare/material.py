"""Streams to record: noise, so that the encoder has to spend what it is told to, without reordered pictures."""

import os

import machine

FRAME_RATE = "60000/1001"
# 1280 pictures at 59.94 and 1001 frames of sound are equally long, so that a clip can be repeated without a gap.
PICTURES = 1280
SOUND_FRAMES = 1001


def encode(options, *arguments):
    machine.run(["ffmpeg", "-v", "error", "-y", *arguments], options.work, options.work)


def clip(options, megabits):
    """21.4 s, 720p at 59.94 with AAC, made once a run."""
    path = os.path.join(options.work, f"clip{megabits}.mp4")
    if not os.path.exists(path):
        rate = f"{megabits * 1000}k"
        size = "320x180" if options.smoke else "1280x720"
        video = os.path.join(options.work, "video.mp4")
        sound = os.path.join(options.work, "sound.aac")
        encode(options, "-f", "lavfi", "-i", f"testsrc2=s={size}:r={FRAME_RATE},noise=alls=40:allf=t",
               "-frames:v", str(PICTURES), "-c:v", "libx264", "-preset", "ultrafast", "-pix_fmt", "yuv420p", "-bf", "0",
               "-g", "60", "-b:v", rate, "-maxrate", rate, "-bufsize", rate, video)
        # Through a stream without timestamps, which drops the encoder's delay.
        encode(options, "-f", "lavfi", "-i", "sine=r=48000", "-frames:a", str(SOUND_FRAMES), "-c:a", "aac", "-ac", "2",
               "-b:a", "128k", "-f", "adts", sound)
        encode(options, "-i", video, "-i", sound, "-c", "copy", path)
        os.remove(video)
        os.remove(sound)
    return path


def stream(options, minutes):
    """That clip over and over as MPEG-TS, 6 Mb/s."""
    path = os.path.join(options.work, f"stream{minutes:g}.ts")
    if not os.path.exists(path):
        encode(options, "-stream_loop", "-1", "-i", clip(options, 6), "-t", str(minutes * 60), "-map", "0", "-c", "copy",
               "-f", "mpegts", path)
    return path
