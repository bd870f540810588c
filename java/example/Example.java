import com.zentq.tqe.phonoweave.EndPointDetector;
import com.zentq.tqe.phonoweave.EngineLog;
import com.zentq.tqe.phonoweave.Utterance;
import java.io.File;
import java.io.IOException;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.util.List;
import java.util.Locale;
import javax.sound.sampled.AudioFormat;
import javax.sound.sampled.AudioInputStream;
import javax.sound.sampled.AudioSystem;
import javax.sound.sampled.UnsupportedAudioFileException;

/** Prints the utterances of a recording: {@code java -jar orvalis-example.jar FILE.wav}. */
public final class Example {
  private static boolean headed;

  private Example() {}

  /** Takes the name of a file: 16 bits, one channel, 8 or 16 kHz. */
  public static void main(String[] arguments) throws IOException {
    if (arguments.length != 1) {
      System.err.println("usage: java -jar orvalis-example.jar FILE.wav");
      System.exit(2);
    }
    EngineLog.off();
    try (AudioInputStream audio = AudioSystem.getAudioInputStream(new File(arguments[0]))) {
      printUtterances(audio);
    } catch (UnsupportedAudioFileException | IOException error) {
      System.err.println(arguments[0] + ": " + error.getMessage());
      System.exit(1);
    }
  }

  private static void printUtterances(AudioInputStream audio)
      throws IOException, UnsupportedAudioFileException {
    AudioFormat format = audio.getFormat();
    int rateHz = (int) format.getSampleRate();
    if (format.getSampleSizeInBits() != 16
        || format.getChannels() != 1
        || format.getEncoding() != AudioFormat.Encoding.PCM_SIGNED
        || (rateHz != 8000 && rateHz != 16000)) {
      throw new UnsupportedAudioFileException("not 16 bits, mono, 8 or 16 kHz: " + format);
    }
    ByteOrder order = format.isBigEndian() ? ByteOrder.BIG_ENDIAN : ByteOrder.LITTLE_ENDIAN;
    byte[] bytes = new byte[8192];
    try (EndPointDetector detector = EndPointDetector.at(rateHz).leadIn(true).open()) {
      for (int count = audio.read(bytes); count > 0; count = audio.read(bytes)) {
        short[] samples = new short[count / 2];
        ByteBuffer.wrap(bytes, 0, count).order(order).asShortBuffer().get(samples);
        print(detector.push(samples), rateHz);
      }
      print(detector.flush(), rateHz);
    }
    if (!headed) System.out.println("no utterance");
  }

  private static void print(List<Utterance> found, double rateHz) {
    for (Utterance utterance : found) {
      if (!headed) System.out.println("utterance     start       end  duration");
      headed = true;
      System.out.printf(
          Locale.ROOT,
          "%9d %9.3f %9.3f %9.3f%s%n",
          utterance.number,
          utterance.start / rateHz,
          utterance.end / rateHz,
          (utterance.end - utterance.start) / rateHz,
          utterance.open ? "  open" : "");
    }
  }
}
