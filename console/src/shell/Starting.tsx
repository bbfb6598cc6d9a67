import { ApiError } from '../api/error';
import { ConnectionBanner, ErrorAlert, Loading } from '../ui';

interface StartingProps {
  error: unknown;
  onRetry: () => void;
}

// What is seen until it is known who is here.
export function Starting({ error, onRetry }: StartingProps) {
  const lost = error instanceof ApiError && error.lost;
  return (
    <main className="vorn-starting">
      <ConnectionBanner />
      {error === undefined && <Loading />}
      {error !== undefined && !lost && <ErrorAlert error={error} onRetry={onRetry} />}
    </main>
  );
}
