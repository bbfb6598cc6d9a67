import { fileURLToPath } from 'node:url';
import react from '@vitejs/plugin-react';
import type { Plugin } from 'vite';
import { defineConfig } from 'vitest/config';

const catalogue = fileURLToPath(new URL('../appliance/catalogue', import.meta.url));

// The library's web fonts weigh more than the rest of the page: the system's fonts take their place (theme/base.css).
function withoutWebFonts(): Plugin {
  return {
    name: 'without-web-fonts',
    enforce: 'pre',
    transform(code, id) {
      if (!/@patternfly.*\.css(\?|$)/.test(id)) return null;
      return code.replace(/@font-face\s*\{[^}]*\}/g, '');
    },
  };
}

export default defineConfig({
  base: './',
  plugins: [withoutWebFonts(), react()],
  resolve: { alias: { '@catalogue': catalogue } },
  build: {
    target: 'es2022',
    outDir: 'dist',
    assetsInlineLimit: 0,
    // One for all: the loader of a view's file does not ask again for styles that it could not get.
    cssCodeSplit: false,
    modulePreload: { polyfill: false },
    reportCompressedSize: false,
  },
  server: {
    fs: { allow: ['.', catalogue] },
    proxy: {
      '/session': process.env.VORN_API ?? 'http://127.0.0.1:8080',
      '/webapi': process.env.VORN_API ?? 'http://127.0.0.1:8080',
    },
  },
  preview: {
    proxy: {
      '/session': process.env.VORN_API ?? 'http://127.0.0.1:8080',
      '/webapi': process.env.VORN_API ?? 'http://127.0.0.1:8080',
    },
  },
  test: {
    environment: 'jsdom',
    setupFiles: ['./test/setup.ts'],
    include: ['src/**/*.test.{ts,tsx}', 'test/**/*.test.{ts,tsx}'],
    css: false,
    restoreMocks: true,
    testTimeout: 15000,
    server: { deps: { inline: [/@patternfly/] } },
  },
});
