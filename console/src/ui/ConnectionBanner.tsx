import {
  Alert,
  AlertActionCloseButton,
  AlertActionLink,
} from '@patternfly/react-core/dist/esm/components/Alert';
import { useEffect } from 'react';
import { connection, dismissRestored, retryNow } from '../api/connection';
import { useStore } from '../api/store';
import { t } from '../texts';
import { useNow } from './useNow';

const kRestoredShown = 6000;

// Says that the appliance does not answer and when it is asked again; and, for a while, that it is back.
export function ConnectionBanner() {
  const now = useStore(connection);
  const lost = now.state === 'lost';
  const clock = useNow(500, lost);
  const restored = now.state === 'ok' && now.restored;
  useEffect(() => {
    if (!restored) return;
    const timer = setTimeout(dismissRestored, kRestoredShown);
    return () => clearTimeout(timer);
  }, [restored]);

  const seconds = lost && now.nextTry !== null ? Math.max(1, Math.ceil((now.nextTry - clock) / 1000)) : 0;
  return (
    <div className="vorn-connection">
      <div role="alert">
        {lost && (
          <Alert
            isInline
            variant="warning"
            component="p"
            title={t('connection.lost')}
            actionLinks={
              <AlertActionLink onClick={retryNow} isDisabled={now.nextTry === null}>
                {t('connection.retry')}
              </AlertActionLink>
            }
          >
            {/* The count-down is not read out: it would never end. */}
            <span aria-hidden="true">
              {now.nextTry === null ? t('connection.asking') : t('connection.next', { count: seconds })}
            </span>
          </Alert>
        )}
      </div>
      <div role="status">
        {restored && (
          <Alert
            isInline
            variant="success"
            component="p"
            title={t('connection.restored')}
            actionClose={<AlertActionCloseButton onClose={dismissRestored} aria-label={t('common.close')} />}
          />
        )}
      </div>
    </div>
  );
}
