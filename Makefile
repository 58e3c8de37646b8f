# Two commands set up everything on a fresh Debian machine:
#   make demo   builds the library and the tool and runs the main job
#   make test   configures, builds and runs every test preset
# Both install missing Debian packages first when run as root.

PRESETS      ?= default asan armhf fuzz
FUZZ_SECONDS ?= 300
DEB_PACKAGES  = cmake make g++ ccache pkg-config googletest libgtest-dev libbenchmark-dev \
                clang-14 libclang-rt-14-dev crossbuild-essential-armhf qemu-user libjpeg-dev \
                libpng-dev libexif-dev libcli11-dev nlohmann-json3-dev nodejs

# Training the finger-on-lens patch dictionaries (tools/train/README.md);
# npm comes with the machine's Node.js.
TRAIN_DEB_PACKAGES = python3-numpy python3-scipy python3-sklearn python3-skimage python3-pil \
                     python-matplotlib-data mate-backgrounds

.PHONY: all deps build test demo fuzz bench parity install clean sample-photos train-fervl

all: build

deps:
	@missing=""; for p in $(DEB_PACKAGES); do \
	  dpkg-query -W -f='$${Status}' $$p 2>/dev/null | grep -q "install ok installed" || missing="$$missing $$p"; \
	done; \
	if [ -n "$$missing" ]; then \
	  if [ "$$(id -u)" = 0 ]; then \
	    echo "installing:$$missing"; \
	    apt-get update -qq && DEBIAN_FRONTEND=noninteractive apt-get install -y -qq $$missing; \
	  else \
	    echo "missing Debian packages:$$missing (run as root or install them)"; exit 1; \
	  fi; \
	fi

build: deps
	cmake --preset default
	cmake --build --preset default

test: deps sample-photos $(addprefix test-,$(PRESETS))

# Not .PHONY: make skips pattern rules for phony targets; FORCE keeps them
# running every time.
test-%: FORCE
	cmake --preset $*
	cmake --build --preset $*
	ctest --preset $*

FORCE:

# The main job: the sample photos analysed with the lumicor tool (blob, JSON,
# annotated picture), each framed at 1:1 and 16:9.
DEMO_DIR = build/demo
demo: build sample-photos
	@photos=$(PHOTO_CACHE)/package/demo; tool=./build/default/tools/lumicor/lumicor; \
	if ! ls $$photos/*.jpg >/dev/null 2>&1; then echo "no sample photos in $$photos (see make sample-photos)"; exit 1; fi; \
	if [ ! -x $$tool ]; then echo "$$tool was not built (missing Debian packages? see make deps)"; exit 1; fi; \
	$$tool analyze $$photos -o $(DEMO_DIR) --annotate -j 2 || exit 1; \
	for p in $$photos/*.jpg; do \
	  n=$$(basename $$p .jpg); \
	  for a in 1:1 16:9; do \
	    $$tool frame $(DEMO_DIR)/$$n.lmeta --aspect $$a --photo $$p -o $(DEMO_DIR)/$$n.crop-$$(echo $$a | tr : x).png || exit 1; \
	  done; \
	done; \
	echo; echo "outputs in $(DEMO_DIR)/: NAME.lmeta (photo meta), NAME.json (readable meta),"; \
	echo "  NAME.annotated.png (faces, attention areas, fingers), NAME.crop-1x1.png, NAME.crop-16x9.png"

fuzz: deps
	cmake --preset fuzz
	cmake --build --preset fuzz
	@for f in build/fuzz/fuzz_*; do \
	  n=$${f##*/fuzz_}; mkdir -p build/fuzz/fuzz-work/$$n; \
	  echo "== $$n ($(FUZZ_SECONDS) s)"; \
	  $$f -max_total_time=$(FUZZ_SECONDS) -max_len=65536 build/fuzz/fuzz-work/$$n fuzz/corpus/$$n || exit 1; \
	done

bench: build
	@for b in build/default/lumicor_bench build/default/bench_*; do [ -x $$b ] && $$b; done; true

# Face engine against the face networks' reference pipeline (needs npm).
parity: build
	tools/parity/run.sh build/default

train-fervl: build sample-photos
	@missing=""; for p in $(TRAIN_DEB_PACKAGES); do \
	  dpkg-query -W -f='$${Status}' $$p 2>/dev/null | grep -q "install ok installed" || missing="$$missing $$p"; \
	done; \
	if [ -n "$$missing" ]; then \
	  if [ "$$(id -u)" = 0 ]; then \
	    apt-get update -qq && DEBIAN_FRONTEND=noninteractive apt-get install -y -qq $$missing; \
	  else \
	    echo "missing Debian packages:$$missing (run as root or install them)"; exit 1; \
	  fi; \
	fi
	cmake --build build/default --target fervl_patches
	/usr/bin/python3 tools/train/train_fervl.py
	cmake --build build/default --target fervl_patches
	/usr/bin/python3 tools/train/train_fervl.py --evaluate --reuse

install: build
	cmake --install build/default

# Sample photos for `make demo`, the similarity quality check (tools/siml_rank)
# and the finger training: the demo JPEGs of the face networks' npm package,
# which configuring fetches into the dependency cache (cmake/LumicorFaceModels.cmake).
# build/cache/face-api points there, so the package is fetched once.
FACE_API_VERSION = 1.7.15
DEPS_CACHE    = $(or $(LUMICOR_DEPS_CACHE),$(HOME)/.cache/lumicor)
PHOTO_CACHE   = build/cache/face-api
sample-photos: deps
	@if [ ! -f $(DEPS_CACHE)/face-api-$(FACE_API_VERSION)/package/demo/sample1.jpg ]; then \
	  cmake --preset default >/dev/null || exit 1; \
	fi; \
	mkdir -p build/cache && rm -rf $(PHOTO_CACHE) && ln -s $(DEPS_CACHE)/face-api-$(FACE_API_VERSION) $(PHOTO_CACHE)

clean:
	rm -rf build
