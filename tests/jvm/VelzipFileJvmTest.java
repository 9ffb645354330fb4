import com.velmor.coreutil.toolkit.VelzipFile;

import java.io.ByteArrayOutputStream;
import java.io.File;
import java.io.IOException;
import java.nio.charset.StandardCharsets;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.Arrays;
import java.util.List;
import java.util.Objects;
import java.util.Random;

/**
 * VelzipFile in the real JVM (run with -Xcheck:jni) over the Linux build of src/velzip and the
 * stand-in Zelbrin library: every native method once at least, and the overloads bound to the
 * right forms. A plain runner: it ends with the line "N passed, N failed".
 */
public final class VelzipFileJvmTest {
    private static int passed;
    private static int failed;

    private VelzipFileJvmTest() {}

    private static void eq(Object expected, Object actual, String what) {
        if (Objects.equals(expected, actual)) {
            passed++;
        } else {
            failed++;
            System.out.println("FAIL: " + what + ": expected <" + expected + "> but was <" + actual + ">");
        }
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
            codec(dir.resolve("reset.vz").toString());
        } catch (RuntimeException e) {
            e.printStackTrace(System.out);
            failed++;
        } finally {
            for (File f : Objects.requireNonNull(dir.toFile().listFiles())) {
                f.delete();
            }
            Files.delete(dir);
        }
        System.out.println(passed + " passed, " + failed + " failed");
        System.exit(failed == 0 ? 0 : 1);
    }

    private static void fileState(Path dir) {
        VelzipFile.initialize();
        failure(0, null, "nothing recorded at load");
        eq(true, VelzipFile.closeFileN(), "close with nothing open");
        eq(false, VelzipFile.openFileN(null, false), "null path");
        failure(1, "NULL file path detected.\n", "null path");
        eq(false, VelzipFile.openFileN("", true), "empty path");
        failure(2, "File path is the empty string.\n", "empty path");
        String missing = dir.resolve("missing-\u00e9\uD83D\uDE00.vz").toString();
        eq(false, VelzipFile.openFileN(missing, false), "missing file");
        failure(5, "File " + missing + " does not exist.", "missing file, its name back through modified UTF-8");
        eq(false, VelzipFile.printLineN("x"), "print without a file");
        failure(8, "Output stream has not been initialized.", "print without a file");
        eq(0, VelzipFile.getNumCompressedBytesN(), "file byte count without a file");
        failure(9, "Input stream has not been initialized.", "the no-argument overload binds to the file form");
    }

    private static void streamIo(Path dir) throws IOException {
        List<String> lines = List.of("abc\n", "\n", "w".repeat(2046) + "\n",
                "caf\u00e9 \u65e5\u672c \uD83D\uDE00\n", "nul\u0000inside\n", "last\n");
        Path file = dir.resolve("t\u00e9st-\uD83D\uDE00.vz");
        eq(true, VelzipFile.openFileN(file.toString(), true), "open a new file for writing");
        failure(0, null, "a successful open clears the record");
        for (String line : lines) {
            eq(true, VelzipFile.printLineN(line), "printLineN of " + line.length());
        }
        eq(false, VelzipFile.printLineN(null), "printLineN(null)");
        eq(0, VelzipFile.getErrorIdN(), "printLineN(null) records nothing");
        byte[] block = new byte[100000];
        new Random(7).nextBytes(block);
        eq(1, VelzipFile.writeDataN(block, block.length), "writeDataN");
        eq(0, VelzipFile.writeDataN(null, 0), "writeDataN(null)");
        failure(14, "Incorrect buffer sizes specified.", "writeDataN(null)");
        eq(true, VelzipFile.isVelmorZipN(), "isVelmorZipN on the file being written");
        eq(true, VelzipFile.closeFileN() && Files.exists(file), "the file has its UTF-8 name");

        eq(true, VelzipFile.openFileN(file.toString(), false), "open for reading");
        for (String line : lines) {
            eq(line, VelzipFile.readLineN(), "readLineN");
        }
        ByteArrayOutputStream got = new ByteArrayOutputStream();
        byte[] buffer = new byte[65536];
        int n;
        while ((n = VelzipFile.readDataN(buffer, buffer.length)) > 0) {
            got.write(buffer, 0, n);
        }
        eq(List.of(0, 0), List.of(n, VelzipFile.getErrorIdN()), "the end gives 0 and is no failure");
        eq(true, Arrays.equals(block, got.toByteArray()), "blocks round trip");
        eq(false, VelzipFile.isVelmorEncryptedN(), "version text 00");
        eq((int) Files.size(file) - 16, VelzipFile.getNumCompressedBytesN(), "compressed bytes of the open file");
        eq(null, VelzipFile.readLineN(), "readLineN at the end");
        eq(List.of(0, 14), List.of(VelzipFile.readDataN(null, 3), VelzipFile.getErrorIdN()), "readDataN(null)");
        eq(true, VelzipFile.closeFileN(), "close after reading");
    }

    private static void codec(String reset) {
        byte[] text = "velzip stream header zlib ".repeat(400).getBytes(StandardCharsets.US_ASCII);
        int bound = (int) (text.length * 1.01 + 36);
        byte[] packed = new byte[bound];
        int n = VelzipFile.encodeMemN(packed, bound, text, text.length);
        eq(true, n > 16 && n < 1000, "encodeMemN compresses text: " + n);
        eq(n - 16, VelzipFile.getNumCompressedBytesN(packed), "byte-array compressed count");
        eq(text.length, VelzipFile.getNumUncompressedBytesN(packed), "byte-array uncompressed count");
        eq(text.length + 1, VelzipFile.getSizeofUnCompressedBuffer(packed), "getSizeofUnCompressedBuffer");
        eq(16, VelzipFile.getNumHeaderBytesN(), "getNumHeaderBytesN");
        eq(1016, VelzipFile.getSizeofCompressedBuffer(1000, true, false, false), "getSizeofCompressedBuffer");
        eq(List.of(0, 0), List.of(VelzipFile.getNumCompressedBytesN((byte[]) null),
                VelzipFile.getNumUncompressedBytesN(new byte[15])), "null and short header arrays");
        byte[] back = new byte[20000];
        eq(text.length, VelzipFile.decodeMemN(back, back.length, packed, n), "decodeMemN");
        eq(true, Arrays.equals(text, Arrays.copyOf(back, text.length)), "memory round trip");

        byte[] dst = new byte[2000];
        eq(true, VelzipFile.encodeMemN(dst, 137, text, 100) > 0, "encodeMemN accepts 137 for 100");
        eq(true, VelzipFile.openFileN(reset, true) && VelzipFile.closeFileN(), "reset");
        VelzipFile.decodeMemN(dst, 137, text, 100);
        eq(0, VelzipFile.getErrorIdN(), "decodeMemN accepts 137 for 100");
        eq(List.of(0, 0, 14), List.of(VelzipFile.encodeMemN(dst, 136, text, 100),
                VelzipFile.decodeMemN(dst, 136, text, 100), VelzipFile.getErrorIdN()), "136 for 100 refused with 14");
        eq(List.of(0, 0), List.of(VelzipFile.encodeMemN(dst, 2000, null, 0),
                VelzipFile.decodeMemN(dst, 2001, text, 10)), "a null source, dstSize beyond dst");
    }
}
