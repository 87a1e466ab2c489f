// kxacore image: the pixel library applied to PNG and JPEG photos.
//
// Images are read through libvips into the alpha-first layout the pixel
// functions use (one-band grey files stay one channel) and written back the
// same way. Every failure - unreadable input, sizes that do not fit, bad
// option values - prints "kxacore: <message>" and exits with status 2; the
// output file is only written, atomically, after the operation succeeded.

#include <iostream>
#include <memory>
#include <optional>
#include <sstream>
#include <string>

#include "kxacore/Imaging/IPLEllipseMask.h"
#include "kxacore/Imaging/IPLPixelOperations.h"
#include "kxacore/Imaging/KXCCroppedShape.h"
#include "kxacore/Platform/KXAImage.h"
#include "tools/kxacore/Commands.h"

namespace {

// Exit status 2 without CLI11's usage text: a RuntimeError is not printed by
// CLI::App::exit, so the message is printed here.
[[noreturn]] void fail(const std::string& message) {
  std::cerr << "kxacore: " << message << '\n';
  throw CLI::RuntimeError(message, 2);
}

struct ImageOptions {
  std::string input, output, maskPath;
  int radius = 1;
  bool repeat = false;
  int amount = 0;
  float brightness = 0, contrast = 0, shiftAmount = 0;
  bool alternative = false;
  int angle = 0;
  bool constantWeight = false;
  long x = 0, y = 0, size = 0;
  bool redOnly = false;
  int alpha = 255;
  bool demultiply = false, premultiply = false;
  bool invert = false;
  bool json = false;
};

// libvips messages end in a line break.
std::string trimmed(std::string text) {
  while (!text.empty() && (text.back() == '\n' || text.back() == ' ')) text.pop_back();
  return text;
}

std::string number(double value) {
  std::ostringstream out;
  out << value;
  return out.str();
}

KXAImage load(const std::string& path, KXAImage::Load mode = KXAImage::Load::asStored) {
  std::string error;
  auto image = KXAImage::imageWithContentsOfFile(path, mode, &error);
  error = trimmed(error);
  if (!image) fail("cannot read image " + path + (error.empty() ? "" : ": " + error));
  return std::move(*image);
}

void save(const KXAImage& image, const std::string& path) {
  std::string error;
  const bool written = image.writeToFile(path, &error);
  error = trimmed(error);
  if (!written) fail("cannot write image " + path + (error.empty() ? "" : ": " + error));
}

void finish(const ImageOptions& options, const char* operation, const KXAImage& image,
            nlohmann::ordered_json extra = nlohmann::ordered_json::object()) {
  save(image, options.output);
  if (!options.json) return;
  nlohmann::ordered_json object{{"operation", operation},
                                {"input", options.input},
                                {"output", options.output},
                                {"width", image.width()},
                                {"height", image.height()},
                                {"channels", image.bytesPerPixel()}};
  for (const auto& [key, value] : extra.items()) object[key] = value;
  printJsonLine(object);
}

KXAImage loadColour(const ImageOptions& options) { return load(options.input, KXAImage::Load::colour); }

// The blur family on every channel of the image (one for grey, four for
// alpha-first colour, each with a step of 4).
void runFilter(const ImageOptions& options, const char* operation, int morphology, int blur) {
  if (options.radius < 0 || static_cast<std::size_t>(options.radius) > IPLMaximumBlurRadius)
    fail("--radius must be 0 to " + std::to_string(IPLMaximumBlurRadius));
  KXAImage image = load(options.input);
  const std::size_t channels = image.bytesPerPixel();
  for (std::size_t channel = 0; channel < channels; ++channel) {
    std::uint8_t* plane = image.bytes() + channel;
    IPLBlur(plane, plane, image.width(), image.height(), channels, channels, image.rowBytes(),
            image.rowBytes(), static_cast<std::size_t>(options.radius), morphology, blur);
  }
  finish(options, operation, image, {{"radius", options.radius}});
}

void checkByte(int value, const char* option) {
  if (value < 0 || value > 255) fail(std::string(option) + " must be 0 to 255");
}

// The square of a disc tool must lie inside the image.
std::size_t squareOffset(const ImageOptions& options, const KXAImage& image) {
  if (options.size <= 0) fail("--size must be positive");
  if (options.x < 0 || options.y < 0 || static_cast<std::size_t>(options.x + options.size) > image.width() ||
      static_cast<std::size_t>(options.y + options.size) > image.height()) {
    fail("the square at " + std::to_string(options.x) + "," + std::to_string(options.y) + " of size " +
         std::to_string(options.size) + " does not fit in the " + std::to_string(image.width()) + "x" +
         std::to_string(image.height()) + " image");
  }
  return static_cast<std::size_t>(options.y) * image.rowBytes() + static_cast<std::size_t>(options.x) * 4;
}

void runPixelOperation(const std::string& operation, const ImageOptions& options) {
  if (operation == "tint") {
    checkByte(options.amount, "--amount");
    KXAImage image = loadColour(options);
    IPLApplyTintTo32BitAlphaFirstImage(image.bytes(), image.bytes(), image.width(), image.height(),
                                       image.rowBytes(), image.rowBytes(), 0, 0,
                                       static_cast<std::uint8_t>(options.amount));
    finish(options, "tint", image, {{"amount", options.amount}});
  } else if (operation == "tone") {
    KXAImage image = loadColour(options);
    const IPLToneAmounts used = IPLApplyToneLUTTo32BitARGBImage(
        image.bytes(), image.bytes(), image.width(), image.height(), image.rowBytes(), image.rowBytes(),
        options.alternative ? 1 : 0, options.brightness, options.contrast);
    if (!options.json) std::cout << "brightness " << used.brightness << " contrast " << used.contrast << '\n';
    finish(options, "tone", image, {{"brightness", used.brightness}, {"contrast", used.contrast}});
  } else if (operation == "hue-shift") {
    KXAImage image = loadColour(options);
    IPLApplyCustomLUTTo32BitARGBImage(image.bytes(), image.bytes(), image.width(), image.height(),
                                      image.rowBytes(), image.rowBytes(), options.angle,
                                      options.constantWeight ? 1 : 0, options.shiftAmount);
    finish(options, "hue-shift", image, {{"angle", options.angle}, {"amount", options.shiftAmount}});
  } else if (operation == "whiten" || operation == "remove-cast") {
    KXAImage image = loadColour(options);
    const std::size_t offset = squareOffset(options, image);
    std::uint8_t* square = image.bytes() + offset;
    const auto side = static_cast<std::size_t>(options.size);
    if (operation == "whiten") {
      IPLTeethWhitenerFrom32BitARGBImage(square, square, side, image.rowBytes(), image.rowBytes());
    } else {
      IPLRemoveEncircledChromaFrom32BitARGBImage(square, square, side, image.rowBytes(), image.rowBytes(),
                                                 options.redOnly ? 1 : 0);
    }
    finish(options, operation.c_str(), image);
  } else if (operation == "demultiply") {
    KXAImage image = loadColour(options);
    IPLDemultiplyAlphaFrom32BitAlphaFirstImage(image.bytes(), image.bytes(), image.width(), image.height(),
                                               image.rowBytes(), image.rowBytes());
    finish(options, "demultiply", image);
  } else if (operation == "clear-alpha") {
    checkByte(options.alpha, "--alpha");
    KXAImage image = loadColour(options);
    IPLClearAlphaChannelOf32BitAlphaFirstImage(image.bytes(), image.bytes(), image.width(), image.height(),
                                               image.rowBytes(), image.rowBytes(),
                                               static_cast<std::uint8_t>(options.alpha),
                                               options.demultiply ? 1 : 0, options.premultiply ? 1 : 0);
    finish(options, "clear-alpha", image, {{"alpha", options.alpha}});
  } else if (operation == "mask") {
    KXAImage image = loadColour(options);
    const KXAImage mask = load(options.maskPath, KXAImage::Load::grey);
    if (mask.width() != image.width() || mask.height() != image.height()) {
      fail("the mask is " + std::to_string(mask.width()) + "x" + std::to_string(mask.height()) +
           " but the image is " + std::to_string(image.width()) + "x" + std::to_string(image.height()));
    }
    IPLApply8BitMaskTo32BitAlphaFirstImage(image.bytes(), mask.bytes(), image.bytes(), image.width(),
                                           image.height(), image.rowBytes(), 1, mask.rowBytes(),
                                           image.rowBytes(), 0, 0, options.invert ? 1 : 0);
    finish(options, "mask", image, {{"mask", options.maskPath}});
  }
}

CLI::App* addImageVerb(CLI::App* image, const std::string& name, const std::string& description,
                       ImageOptions& options) {
  CLI::App* verb = image->add_subcommand(name, description);
  verb->add_option("IN", options.input, "PNG or JPEG to read")->required();
  verb->add_option("OUT", options.output, "Image to write (format from the extension)")->required();
  verb->add_flag("--json", options.json,
                 "One JSON object: operation, input, output, width, height, channels and the amounts used");
  return verb;
}

void registerFilterVerbs(CLI::App* image) {
  struct Filter {
    const char* name;
    const char* description;
    int morphology, blur;
  };
  static constexpr Filter kFilters[] = {
      {"blur", "Box blur (or repeated 3-tap blur with --repeat) of every channel", IPLMorphologyNone, IPLBlurBox},
      {"erode", "Minimum filter of every channel; dark borders within the radius", IPLMorphologyErode,
       IPLBlurNone},
      {"dilate", "Maximum filter of every channel", IPLMorphologyDilate, IPLBlurNone},
  };
  for (const Filter& filter : kFilters) {
    auto options = std::make_shared<ImageOptions>();
    CLI::App* verb = addImageVerb(image, filter.name, filter.description, *options);
    verb->add_option("--radius", options->radius, "Radius in pixels (default 1)");
    if (filter.blur == IPLBlurBox) verb->add_flag("--repeat", options->repeat, "Repeated 3-tap blur instead of box");
    verb->callback([options, filter] {
      const int blur = filter.blur == IPLBlurBox && options->repeat ? IPLBlurGaussian : filter.blur;
      runFilter(*options, filter.name, filter.morphology, blur);
    });
  }
}

void registerPixelVerbs(CLI::App* image) {
  const auto verb = [image](const char* name, const char* description) {
    auto options = std::make_shared<ImageOptions>();
    CLI::App* command = addImageVerb(image, name, description, *options);
    command->callback([options, name] { runPixelOperation(name, *options); });
    return std::make_pair(command, options);
  };
  {
    auto [command, options] = verb("tint", "Move colours toward white by AMOUNT / 255");
    command->add_option("--amount", options->amount, "0 to 255")->required();
  }
  {
    auto [command, options] = verb("tone", "Brightness and contrast curve; prints the amounts actually used");
    command->add_option("--brightness", options->brightness, "About -1 to 1 (default 0)");
    command->add_option("--contrast", options->contrast, "About -1 to 1 (default 0)");
    command->add_flag("--alternative", options->alternative, "Piecewise-linear curve, no limits");
  }
  {
    auto [command, options] = verb("hue-shift", "Shift colours along a hue angle");
    command->add_option("--angle", options->angle, "Whole degrees")->required();
    command->add_option("--amount", options->shiftAmount, "Strength, about -1 to 1")->required();
    command->add_flag("--constant-weight", options->constantWeight, "Same weight 0.5 at every level");
  }
  for (const char* name : {"whiten", "remove-cast"}) {
    const bool whiten = std::string(name) == "whiten";
    auto [command, options] =
        verb(name, whiten ? "Whiten yellowish pixels in the disc of a square"
                          : "Pull colours toward grey in the disc of a square, most at the centre");
    command->add_option("--x", options->x, "Left edge of the square")->required();
    command->add_option("--y", options->y, "Top edge of the square")->required();
    command->add_option("--size", options->size, "Side of the square")->required();
    if (!whiten) command->add_flag("--red-only", options->redOnly, "Act on reddish casts only");
  }
  verb("demultiply", "Undo premultiplied alpha (colours above their alpha wrap)");
  {
    auto [command, options] = verb("clear-alpha", "Set every alpha; optionally demultiply first or premultiply");
    command->add_option("--alpha", options->alpha, "New alpha, 0 to 255")->required();
    command->add_flag("--demultiply", options->demultiply, "Undo premultiplied source colours first");
    command->add_flag("--premultiply", options->premultiply, "Scale colours by the new alpha (below 255)");
  }
  {
    auto [command, options] = verb("mask", "Set alpha from a grey mask of the same size");
    command->add_option("--mask", options->maskPath, "Mask image (converted to grey)")->required();
    command->add_flag("--invert", options->invert, "Use 255 - mask");
  }
}

void registerEllipseAndShape(CLI::App* image) {
  struct EllipseOptions {
    double width = 0, height = 0;
    std::string output;
    bool soft = false, json = false;
  };
  auto ellipse = std::make_shared<EllipseOptions>();
  CLI::App* mask = image->add_subcommand("ellipse-mask", "Write a grey oval mask of WIDTH x HEIGHT pixels");
  mask->add_option("WIDTH", ellipse->width, "Width in pixels")->required();
  mask->add_option("HEIGHT", ellipse->height, "Height in pixels")->required();
  mask->add_option("OUT", ellipse->output, "Image to write")->required();
  mask->add_flag("--soft", ellipse->soft, "Shrink by 2 pixels and soften the edge");
  mask->add_flag("--json", ellipse->json, "One JSON object: output, width, height, soft");
  mask->callback([ellipse] {
    const auto made = CreateEllipseImageMask(ellipse->soft, ellipse->width, ellipse->height);
    if (!made) fail("cannot make a mask of " + number(ellipse->width) + " x " + number(ellipse->height) +
                    " pixels (each side must be 1 to 32767)");
    save(*made, ellipse->output);
    if (ellipse->json) {
      printJsonLine({{"output", ellipse->output},
                     {"width", made->width()},
                     {"height", made->height()},
                     {"soft", ellipse->soft}});
    }
  });

  struct ShapeOptions {
    std::string json;
    bool asJson = false;
  };
  auto shapeOptions = std::make_shared<ShapeOptions>();
  CLI::App* shape = image->add_subcommand("shape", "Print a cropped shape's normalised JSON and whether it covers the image");
  shape->add_option("JSON", shapeOptions->json, "The shape's JSON text")->required();
  shape->add_flag("--json", shapeOptions->asJson, "One JSON object: shape, croppedByWholeImage");
  shape->callback([shapeOptions] {
    const auto parsed = KXCCroppedShape::croppedShapeFromJSONString(shapeOptions->json);
    if (!parsed) fail("not a cropped shape: needs a JSON object with \"type\", \"x\", \"y\", \"width\" and \"height\"");
    if (shapeOptions->asJson) {
      printJsonLine({{"shape", parsed->jsonDictionary()}, {"croppedByWholeImage", parsed->croppedByWholeImage()}});
    } else {
      std::cout << parsed->jsonString() << "\nwhole image: " << (parsed->croppedByWholeImage() ? "yes" : "no")
                << '\n';
    }
  });
}

}  // namespace

void registerImageCommands(CLI::App& app) {
  CLI::App* image = app.add_subcommand("image", "Photo restoration filters on PNG and JPEG images");
  image->require_subcommand(1);
  registerFilterVerbs(image);
  registerPixelVerbs(image);
  registerEllipseAndShape(image);
}
