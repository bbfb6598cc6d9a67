import { lazy, type ComponentType, type LazyExoticComponent } from 'react';
import { connection, connectionLost } from '../api/connection';

const kTries = 3;

const files: (() => Promise<unknown>)[] = [];

function connected(): Promise<void> {
  return new Promise((done) => {
    const look = () => {
      if (connection.get().state === 'lost') return;
      stop();
      done();
    };
    const stop = connection.subscribe(look);
    look();
  });
}

// A file that can't be had counts as a lost connection, and is asked for again when the appliance is back. One that is
// gone for good, as after an update, fails in the end.
async function insist<T>(load: () => Promise<T>): Promise<T> {
  for (let tries = 1; ; tries++) {
    try {
      return await load();
    } catch (error) {
      if (tries === kTries) throw error;
      connectionLost();
      await connected();
    }
  }
}

// A component in a file of its own, loaded when it is shown or by loadViews().
export function viewFile<P>(
  load: () => Promise<{ default: ComponentType<P> }>,
): LazyExoticComponent<ComponentType<P>> {
  files.push(load);
  return lazy(() => insist(load));
}

// Loads the files one after the other, so that a view opens also when the appliance is gone by then.
export async function loadViews(): Promise<void> {
  // A view's file may name further ones, which then follow.
  for (const load of files) {
    try {
      await load();
    } catch {
      // Whoever opens the view is told.
      return;
    }
  }
}
