// Host stand-in for Android's Bitmap: just enough for the JNI tests. The
// pixels live in a direct buffer so that native code can lock them in place
// (host/jnigraphics). Storage always holds at least 4 bytes per pixel, so
// native readers that assume RGBA rows stay inside it whatever the config.
package android.graphics;

import java.nio.ByteBuffer;

public final class Bitmap {
    public enum Config {
        ALPHA_8(8, 1),
        RGB_565(4, 2),
        ARGB_4444(7, 2),
        ARGB_8888(1, 4);

        // AndroidBitmapFormat value and bytes per pixel.
        final int nativeFormat;
        final int bytesPerPixel;

        Config(int nativeFormat, int bytesPerPixel) {
            this.nativeFormat = nativeFormat;
            this.bytesPerPixel = bytesPerPixel;
        }
    }

    private final int mWidth;
    private final int mHeight;
    private final Config mConfig;
    private final ByteBuffer mBuffer;
    // Outstanding AndroidBitmap_lockPixels calls.
    private int mLockCount;

    private Bitmap(int width, int height, Config config) {
        mWidth = width;
        mHeight = height;
        mConfig = config;
        mBuffer = ByteBuffer.allocateDirect(width * height * 4);
    }

    public static Bitmap createBitmap(int width, int height, Config config) {
        if (width <= 0 || height <= 0) throw new IllegalArgumentException("width and height must be > 0");
        if (config == null) throw new NullPointerException("config");
        return new Bitmap(width, height, config);
    }

    public int getWidth() { return mWidth; }
    public int getHeight() { return mHeight; }
    public Config getConfig() { return mConfig; }
    public int getRowBytes() { return mWidth * mConfig.bytesPerPixel; }
    public int getLockCount() { return mLockCount; }
}
