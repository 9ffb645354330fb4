import com.velmor.coreutil.toolkit.VelzipFile;

import java.util.ArrayList;
import java.util.Arrays;
import java.util.List;
import java.util.zip.DataFormatException;
import java.util.zip.Deflater;
import java.util.zip.Inflater;

/**
 * VelzipFile's memory codec in the real JVM (the Linux build of src/velzip and the stand-in
 * Zelbrin library, both over the system zlib) against java.util.zip at the same zlib level:
 * encodeMemN against Deflater, and decodeMemN against Inflater. The data are the bytes
 * bench/bench_velzip.cpp measures (same generator, same FNV-1a). The Velzip output is a
 * 16-byte header and a zlib stream, so at the same level and the same zlib its body is
 * Deflater's output byte for byte; the run checks that, so both sides do the same work.
 * Rounds alternate which side runs first; the best round of each counts.
 */
public final class VelzipJvmBench {
    private static final int DATA_BYTES = 4 << 20;
    private static final int LEVEL = 8; // the level VelzipFile's compressor is set to
    private static final int HEADER_BYTES = 16;
    private static final int WARM_UP_ROUNDS = 2;
    private static final int ROUNDS = 7;

    private VelzipJvmBench() {}

    // ---- The data (bench/bench_velzip.cpp generates the same bytes) ----

    private static int state;

    private static int next() {
        state ^= state << 13;
        state ^= state >>> 17;
        state ^= state << 5;
        return state;
    }

    static byte[] randomBytes(int n) {
        state = 0x9E3779B9;
        byte[] out = new byte[n];
        for (int i = 0; i < n; i += 4) {
            int v = next();
            for (int b = 0; b < 4 && i + b < n; b++) {
                out[i + b] = (byte) (v >>> (8 * b));
            }
        }
        return out;
    }

    private static final String[] WORDS = {"velzip", "stream", "header", "block", "line", "record", "value",
        "window", "folder", "file", "buffer", "the", "of", "and", "to", "a", "report", "total", "count", "error",
        "status", "north", "south", "account", "order", "item", "price", "date", "user", "name", "queue",
        "index"};

    static byte[] textBytes(int n) {
        state = 0x2545F491;
        StringBuilder out = new StringBuilder(n + 128);
        while (out.length() < n) {
            int target = 30 + (next() >>> 1) % 50;
            int length = 0;
            while (length < target) {
                if (length > 0) {
                    out.append(' ');
                    length++;
                }
                int r = next();
                String word = (r & 7) == 0 ? Integer.toString((r >>> 3) % 100000) : WORDS[(r >>> 3) & 31];
                out.append(word);
                length += word.length();
            }
            out.append('\n');
        }
        byte[] all = out.toString().getBytes(java.nio.charset.StandardCharsets.US_ASCII);
        return Arrays.copyOf(all, n);
    }

    static int fnv1a(byte[] bytes) {
        int h = 0x811C9DC5;
        for (byte b : bytes) {
            h = (h ^ (b & 0xFF)) * 16777619;
        }
        return h;
    }

    // ---- The two sides ----

    /** The least dstSize that encodeMemN accepts for srcSize, as its callers compute it. */
    static int encodeBound(int srcSize) {
        return (int) (srcSize * 1.01 + 36);
    }

    static int deflate(byte[] dst, byte[] src) {
        Deflater deflater = new Deflater(LEVEL);
        try {
            deflater.setInput(src);
            deflater.finish();
            int n = 0;
            while (!deflater.finished() && n < dst.length) {
                n += deflater.deflate(dst, n, dst.length - n);
            }
            return deflater.finished() ? n : -1;
        } finally {
            deflater.end();
        }
    }

    static int inflate(byte[] dst, byte[] src, int offset, int length) {
        Inflater inflater = new Inflater();
        try {
            inflater.setInput(src, offset, length);
            int n = 0;
            while (!inflater.finished() && n < dst.length) {
                n += inflater.inflate(dst, n, dst.length - n);
            }
            return inflater.finished() ? n : -1;
        } catch (DataFormatException e) {
            return -1;
        } finally {
            inflater.end();
        }
    }

    /** One measured operation, on one data set, with both sides' times in nanoseconds. */
    static final class Row {
        final String label;
        final int bytes;
        final Side velzip;
        final Side javaZip;
        final List<Long> velzipTimes = new ArrayList<>();
        final List<Long> javaTimes = new ArrayList<>();

        Row(String label, int bytes, Side velzip, Side javaZip) {
            this.label = label;
            this.bytes = bytes;
            this.velzip = velzip;
            this.javaZip = javaZip;
        }
    }

    interface Side {
        boolean run();
    }

    static long time(Side side, List<Long> times) {
        long start = System.nanoTime();
        if (!side.run()) {
            throw new IllegalStateException("a run failed");
        }
        long t = System.nanoTime() - start;
        if (times != null) {
            times.add(t);
        }
        return t;
    }

    static long best(List<Long> times) {
        long best = Long.MAX_VALUE;
        for (long t : times) {
            best = Math.min(best, t);
        }
        return best;
    }

    static long median(List<Long> times) {
        long[] sorted = times.stream().mapToLong(Long::longValue).sorted().toArray();
        return sorted[sorted.length / 2];
    }

    static double megabytesPerSecond(int bytes, long nanos) {
        return bytes / (nanos / 1e9) / 1e6;
    }

    /** Adds an encode and a decode row for one data set, after checking both codecs agree. */
    static void addRows(List<Row> encodeRows, List<Row> decodeRows, String name, byte[] data) {
        int bound = encodeBound(data.length);
        byte[] velzipPacked = new byte[bound];
        byte[] zipPacked = new byte[bound];
        int velzipSize = VelzipFile.encodeMemN(velzipPacked, bound, data, data.length);
        int zipSize = deflate(zipPacked, data);
        boolean same = velzipSize == zipSize + HEADER_BYTES
                && Arrays.equals(velzipPacked, HEADER_BYTES, velzipSize, zipPacked, 0, zipSize);
        System.out.printf("  %-6s %d bytes (FNV-1a %08x): encodeMemN %d bytes, Deflater %d bytes, %s%n", name,
                data.length, fnv1a(data), velzipSize, zipSize,
                same ? "the same zlib stream" : "DIFFERENT zlib streams");
        if (!same) {
            throw new IllegalStateException("encodeMemN and Deflater do not do the same work on " + name);
        }
        // decodeMemN wants room for the data and at least (srcSize * 1.01 + 36) bytes.
        int decodeSize = Math.max(data.length, encodeBound(velzipSize) + 1);
        byte[] out = new byte[decodeSize];
        if (VelzipFile.decodeMemN(out, decodeSize, velzipPacked, velzipSize) != data.length
                || !Arrays.equals(out, 0, data.length, data, 0, data.length)
                || inflate(out, zipPacked, 0, zipSize) != data.length
                || !Arrays.equals(out, 0, data.length, data, 0, data.length)) {
            throw new IllegalStateException("decodeMemN or Inflater does not give the data back on " + name);
        }
        byte[] encodeDst = new byte[bound];
        encodeRows.add(new Row("encodeMemN/Deflater  " + name, data.length,
                () -> VelzipFile.encodeMemN(encodeDst, bound, data, data.length) == velzipSize,
                () -> deflate(encodeDst, data) == zipSize));
        decodeRows.add(new Row("decodeMemN/Inflater  " + name, data.length,
                () -> VelzipFile.decodeMemN(out, decodeSize, velzipPacked, velzipSize) == data.length,
                () -> inflate(out, zipPacked, 0, zipSize) == data.length));
    }

    public static void main(String[] args) {
        System.out.printf("VelzipFile in the real JVM (%s %s, %s) against java.util.zip at zlib level %d%n",
                System.getProperty("java.vm.name"), System.getProperty("java.version"),
                System.getProperty("os.arch"), LEVEL);
        List<Row> rows = new ArrayList<>();
        List<Row> decodeRows = new ArrayList<>();
        addRows(rows, decodeRows, "text", textBytes(DATA_BYTES));
        addRows(rows, decodeRows, "random", randomBytes(DATA_BYTES));
        rows.addAll(decodeRows);
        System.out.printf("  best of %d rounds after %d warm-up rounds%n", ROUNDS, WARM_UP_ROUNDS);

        for (int round = 0; round < WARM_UP_ROUNDS + ROUNDS; round++) {
            boolean counted = round >= WARM_UP_ROUNDS;
            for (Row row : rows) {
                if (round % 2 == 0) {
                    time(row.velzip, counted ? row.velzipTimes : null);
                    time(row.javaZip, counted ? row.javaTimes : null);
                } else {
                    time(row.javaZip, counted ? row.javaTimes : null);
                    time(row.velzip, counted ? row.velzipTimes : null);
                }
            }
        }

        System.out.printf("%n%-28s %10s %10s %7s %8s %8s%n", "", "VelzipFile", "java.util", "ratio", "cost",
                "median");
        System.out.printf("%-28s %10s %10s %7s %8s %8s%n", "", "MB/s", "MB/s", "", "", "ratio");
        for (Row row : rows) {
            long velzip = best(row.velzipTimes);
            long javaZip = best(row.javaTimes);
            double ratio = (double) javaZip / velzip;
            System.out.printf("%-28s %10.1f %10.1f %7.3f %+7.1f%% %8.3f%n", row.label,
                    megabytesPerSecond(row.bytes, velzip), megabytesPerSecond(row.bytes, javaZip), ratio,
                    (1 / ratio - 1) * 100, (double) median(row.javaTimes) / median(row.velzipTimes));
        }
        System.out.println("ratio: VelzipFile's throughput over java.util.zip's; cost: VelzipFile's extra time.");
    }
}
