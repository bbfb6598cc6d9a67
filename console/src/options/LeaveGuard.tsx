import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Modal, ModalBody, ModalFooter, ModalHeader } from '@patternfly/react-core/dist/esm/components/Modal';
import { useEffect, useState } from 'react';
import { keepView } from '../shell/router';
import { t } from '../texts';

// While `dirty`, asks before the view is left: by a link, by the browser's back button, or by closing the window.
export function LeaveGuard({ dirty }: { dirty: boolean }) {
  const [go, setGo] = useState<(() => void) | null>(null);

  useEffect(() => {
    if (!dirty) return;
    const release = keepView((leave) => setGo(() => leave));
    const onUnload = (event: BeforeUnloadEvent) => event.preventDefault();
    window.addEventListener('beforeunload', onUnload);
    return () => {
      release();
      window.removeEventListener('beforeunload', onUnload);
    };
  }, [dirty]);

  if (go === null) return null;
  const stay = () => setGo(null);
  const leave = () => {
    setGo(null);
    go();
  };
  return (
    <Modal isOpen variant="small" onClose={stay} aria-labelledby="leave-title" aria-describedby="leave-body">
      <ModalHeader title={t('form.leave.title')} labelId="leave-title" titleIconVariant="warning" />
      <ModalBody id="leave-body">{t('form.leave.body')}</ModalBody>
      <ModalFooter>
        <Button variant="primary" onClick={stay}>
          {t('form.leave.stay')}
        </Button>
        <Button variant="link" onClick={leave}>
          {t('form.leave.go')}
        </Button>
      </ModalFooter>
    </Modal>
  );
}
