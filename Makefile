# The two commands a user needs: `make run` and `make test`. Both install any
# missing Debian packages first.
SHELL := /bin/bash
JOBS ?= $(shell nproc)
LISTEN ?= 127.0.0.1:8080

.PHONY: run run-ptp test deps release asan tsan tsan-test fuzz package package-test package-try clean

deps:
	@scripts/install-deps.sh

release: deps
	cmake --preset release >/dev/null
	cmake --build --preset release -j $(JOBS)

asan: deps
	cmake --preset asan >/dev/null
	cmake --build --preset asan -j $(JOBS)

# Starts the plug-in in the stand-in host on $(LISTEN) with the built-in
# simulated platform; Ctrl-C stops it.
run: release
	scripts/run.sh build/release $(LISTEN)

# The same over live state: a master and a slave ptp4l daemon in network
# namespaces (root needed); Ctrl-C stops the host and removes the domain.
run-ptp: release
	scripts/run-ptp.sh build/release $(LISTEN)

# Builds everything under AddressSanitizer and UndefinedBehaviorSanitizer and
# runs every test.
test: asan
	ctest --preset asan

tsan-test: deps
	cmake --preset tsan >/dev/null
	cmake --build --preset tsan -j $(JOBS)
	ctest --preset tsan

fuzz:
	@scripts/install-deps.sh fuzz
	cmake --preset fuzz >/dev/null
	cmake --build --preset fuzz -j $(JOBS)

# The Debian packages (build/package/*.deb), from a release tree configured
# for /usr.
package:
	@scripts/install-deps.sh package
	cmake --preset package >/dev/null
	cmake --build --preset package -j $(JOBS)
	cd build/package && cpack -G DEB

# Installs the packages into a scratch root with dpkg, serves the installed
# plug-in from it, and removes them again (needs root).
package-test: package
	scripts/package-test.sh build/package

# Boots a throw-away systemd over an overlay of / (needs root), installs the
# packages in it and opens a shell there; leaving the shell powers it off.
package-try: package
	scripts/systemd-sandbox.sh build/package

clean:
	rm -rf build
