import com.velmor.coreutil.toolkit.VelzipFile;

import java.io.IOException;
import java.nio.charset.StandardCharsets;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.ArrayList;
import java.util.Arrays;
import java.util.Comparator;
import java.util.List;
import java.util.Objects;
import java.util.Random;
import java.util.stream.Stream;

/**
 * VelzipFile in the real JVM (run with -Xcheck:jni) over the Linux build of src/velzip and the
 * stand-in Zelbrin library. A plain runner: it ends with the line "N passed, N failed".
 */
public final class VelzipFileJvmTest {
    private static int passed;
    private static int failed;

    private VelzipFileJvmTest() {}

    private static void check(boolean ok, String what) {
        if (ok) {
            passed++;
        } else {
            failed++;
            System.out.println("FAIL: " + what);
        }
    }

    private static void eq(Object expected, Object actual, String what) {
        check(Objects.equals(expected, actual), what + ": expected <" + expected + "> but was <" + actual + ">");
    }

    private static void failure(int id, String message, String what) {
        eq(id, VelzipFile.getErrorIdN(), what + " (id)");
        eq(message, VelzipFile.getErrorMsgN(), what + " (message)");
    }

    public static void main(String[] args) throws IOException {
        Path dir = Files.createTempDirectory("tessel-jvm");
        try {
            fileState(dir);
            streamIo(dir);
            codec(dir);
        } catch (RuntimeException e) {
            e.printStackTrace(System.out);
            failed++;
        } finally {
            try (Stream<Path> walk = Files.walk(dir)) {
                walk.sorted(Comparator.reverseOrder()).forEach(p -> p.toFile().delete());
            }
        }
        System.out.println(passed + " passed, " + failed + " failed");
        System.exit(failed == 0 ? 0 : 1);
    }

    private static void fileState(Path dir) {
        VelzipFile.initialize();
        failure(0, null, "nothing recorded at load");
        check(VelzipFile.closeFileN(), "close with nothing open");

        check(!VelzipFile.openFileN(null, false), "null path");
        failure(1, "NULL file path detected.\n", "null path");
        check(!VelzipFile.openFileN("", true), "empty path");
        failure(2, "File path is the empty string.\n", "empty path");

        String missing = dir.resolve("missing-\u00e9\uD83D\uDE00.vz").toString();
        check(!VelzipFile.openFileN(missing, false), "missing file");
        failure(5, "File " + missing + " does not exist.", "missing file, text back through modified UTF-8");
        String noFolder = dir.resolve("no-folder").resolve("x.vz").toString();
        check(!VelzipFile.openFileN(noFolder, true), "missing folder");
        failure(7, "Cannot write to file " + noFolder + ".", "missing folder");

        check(!VelzipFile.printLineN("x"), "print without a file");
        failure(8, "Output stream has not been initialized.", "print without a file");
        eq(-1, VelzipFile.readDataN(new byte[4], 4), "readDataN without a file");
        failure(9, "Input stream has not been initialized.", "read without a file");
        eq(0, VelzipFile.getNumCompressedBytesN(), "file byte count without a file");
        check(!VelzipFile.isVelmorZipN(), "isVelmorZipN without a file");
        eq(9, VelzipFile.getErrorIdN(), "the no-argument overload binds to the file form");
    }

    private static final List<String> LINES = Arrays.asList("abc\n", "\n", repeat('w', 2046) + "\n",
            "caf\u00e9 \u65e5\u672c \uD83D\uDE00\n", "nul\u0000inside\n", "last\n");

    private static String repeat(char c, int n) {
        char[] a = new char[n];
        Arrays.fill(a, c);
        return new String(a);
    }

    private static void streamIo(Path dir) throws IOException {
        String path = dir.resolve("t\u00e9st-\uD83D\uDE00.vz").toString();
        check(VelzipFile.openFileN(path, true), "open a new file for writing");
        failure(0, null, "a successful open clears the record");
        for (String line : LINES) {
            check(VelzipFile.printLineN(line), "printLineN " + line.length());
        }
        check(!VelzipFile.printLineN(null), "printLineN(null)");
        eq(0, VelzipFile.getErrorIdN(), "printLineN(null) records nothing");
        byte[] block = new byte[100000];
        new Random(7).nextBytes(block);
        eq(1, VelzipFile.writeDataN(block, block.length), "writeDataN");
        eq(1, VelzipFile.writeDataN(block, 10), "writeDataN of part of the array");
        eq(0, VelzipFile.writeDataN(null, 0), "writeDataN(null)");
        failure(14, "Incorrect buffer sizes specified.", "writeDataN(null)");
        eq(0, VelzipFile.writeDataN(block, -1), "negative length");
        eq(0, VelzipFile.writeDataN(block, block.length + 1), "length beyond the array");
        check(VelzipFile.isVelmorZipN(), "isVelmorZipN on the file being written");
        check(VelzipFile.closeFileN(), "close");
        check(Files.exists(dir.resolve("t\u00e9st-\uD83D\uDE00.vz")), "the file has its UTF-8 name");

        check(VelzipFile.openFileN(path, false), "open for reading");
        for (String line : LINES) {
            eq(line, VelzipFile.readLineN(), "readLineN");
        }
        byte[] expected = new byte[block.length + 10];
        System.arraycopy(block, 0, expected, 0, block.length);
        System.arraycopy(block, 0, expected, block.length, 10);
        byte[] buffer = new byte[65536];
        List<Byte> got = new ArrayList<>();
        int n;
        while ((n = VelzipFile.readDataN(buffer, buffer.length)) > 0) {
            for (int i = 0; i < n; i++) {
                got.add(buffer[i]);
            }
        }
        eq(0, n, "readDataN at the end");
        eq(0, VelzipFile.getErrorIdN(), "the end is no failure");
        byte[] all = new byte[got.size()];
        for (int i = 0; i < all.length; i++) {
            all[i] = got.get(i);
        }
        check(Arrays.equals(expected, all), "blocks round trip (" + all.length + " bytes)");
        check(!VelzipFile.isVelmorEncryptedN(), "version text 00");
        long size = Files.size(dir.resolve("t\u00e9st-\uD83D\uDE00.vz"));
        eq((int) size - 16, VelzipFile.getNumCompressedBytesN(), "compressed bytes of the open file");
        eq(null, VelzipFile.readLineN(), "readLineN at the end");
        eq(0, VelzipFile.readDataN(null, 3), "readDataN(null)");
        eq(14, VelzipFile.getErrorIdN(), "readDataN(null) records 14");
        check(VelzipFile.closeFileN(), "close after reading");
    }

    private static void codec(Path dir) {
        byte[] text = new byte[10000];
        byte[] words = "velzip stream header zlib ".getBytes(StandardCharsets.US_ASCII);
        for (int i = 0; i < text.length; i++) {
            text[i] = words[i % words.length];
        }
        int bound = (int) (text.length * 1.01 + 36);
        byte[] packed = new byte[bound];
        int n = VelzipFile.encodeMemN(packed, bound, text, text.length);
        check(n > 16 && n < 1000, "encodeMemN compresses text: " + n);
        eq(n - 16, VelzipFile.getNumCompressedBytesN(packed), "byte-array compressed count");
        eq(text.length, VelzipFile.getNumUncompressedBytesN(packed), "byte-array uncompressed count");
        eq(text.length + 1, VelzipFile.getSizeofUnCompressedBuffer(packed), "getSizeofUnCompressedBuffer");
        eq(16, VelzipFile.getNumHeaderBytesN(), "getNumHeaderBytesN");
        eq(1016, VelzipFile.getSizeofCompressedBuffer(1000, true, false, false), "getSizeofCompressedBuffer");
        eq(0, VelzipFile.getNumCompressedBytesN((byte[]) null), "null header array");
        eq(0, VelzipFile.getNumUncompressedBytesN(new byte[15]), "short header array");
        byte[] back = new byte[20000];
        eq(text.length, VelzipFile.decodeMemN(back, back.length, packed, n), "decodeMemN");
        check(Arrays.equals(text, Arrays.copyOf(back, text.length)), "memory round trip");

        byte[] dst = new byte[2000];
        check(VelzipFile.encodeMemN(dst, 137, text, 100) > 0, "encodeMemN accepts 137 for 100");
        eq(0, VelzipFile.encodeMemN(dst, 136, text, 100), "encodeMemN refuses 136 for 100");
        eq(14, VelzipFile.getErrorIdN(), "refusal records 14");
        String reset = dir.resolve("reset.vz").toString();
        int[][] decodeEdges = {{1024, 1071}, {100, 137}, {1, 38}, {0, 35}};
        for (int[] e : decodeEdges) {
            check(VelzipFile.openFileN(reset, true) && VelzipFile.closeFileN(), "reset");
            VelzipFile.decodeMemN(dst, e[1], new byte[1024], e[0]);
            eq(0, VelzipFile.getErrorIdN(), "decodeMemN accepts " + e[1] + " for " + e[0]);
            eq(0, VelzipFile.decodeMemN(dst, e[1] - 1, new byte[1024], e[0]), "decodeMemN refusal");
            eq(14, VelzipFile.getErrorIdN(), "decodeMemN refuses " + (e[1] - 1) + " for " + e[0]);
        }
        eq(0, VelzipFile.encodeMemN(dst, 2000, null, 0), "encodeMemN(null src)");
        eq(0, VelzipFile.decodeMemN(dst, 2001, text, 10), "dstSize beyond dst");
    }
}
